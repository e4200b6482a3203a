#include "CameraCodecParameter.h"

namespace android {

namespace {

struct Row {
    int32_t maxBitrate;
    int32_t minBitrateH264;
    int32_t minBitrateOther;
    int32_t bitrate;
    int32_t frameRate;
    int32_t width;
    int32_t height;
};

// Indexed by CameraConfigEnum. The two codec types differ only in the lower
// bit rate bound.
constexpr Row kRows[] = {
    {4000000, 1200000, 1200000, 3000000, 30, 1280, 720},  // CAMERA_720P_30FPS
    {660000, 100000, 75000, 400000, 15, 480, 640},        // CAMERA_VGA_REVERSED_15FPS
    {960000, 100000, 75000, 600000, 30, 480, 640},        // CAMERA_VGA_REVERSED_30FPS
    {372000, 90000, 65000, 256000, 15, 240, 320},         // CAMERA_QVGA_REVERSED_15FPS
    {512000, 90000, 65000, 384000, 30, 240, 320},         // CAMERA_QVGA_REVERSED_30FPS
    {500000, 100000, 75000, 400000, 30, 352, 288},        // CAMERA_CIF_30FPS
    {300000, 70000, 50000, 100000, 30, 176, 144},         // CAMERA_QCIF_30FPS
    {660000, 100000, 75000, 400000, 15, 640, 480},        // CAMERA_VGA_15FPS
    {960000, 100000, 75000, 600000, 30, 640, 480},        // CAMERA_VGA_30FPS
    {372000, 90000, 65000, 256000, 15, 320, 240},         // CAMERA_QVGA_15FPS
    {512000, 90000, 65000, 384000, 30, 320, 240},         // CAMERA_QVGA_30FPS
};

}  // namespace

void CameraCodecParameter::fill(CodecType codecType) {
    std::map<CameraConfigEnum, Param>& map = codecType == CODEC_OTHER ? mOther : mH264;
    int32_t key = 0;
    for (const Row& row : kRows) {
        const int32_t minBitrate = codecType == CODEC_OTHER ? row.minBitrateOther : row.minBitrateH264;
        map[static_cast<CameraConfigEnum>(key++)] =
                Param{row.maxBitrate, minBitrate, row.bitrate, row.frameRate, row.width, row.height};
    }
}

const std::map<CameraCodecParameter::CameraConfigEnum, CameraCodecParameter::Param>&
CameraCodecParameter::mapOf(CodecType codecType) const {
    return codecType == CODEC_OTHER ? mOther : mH264;
}

CameraCodecParameter::Param CameraCodecParameter::getParameter(CameraConfigEnum config,
                                                               CodecType codecType) const {
    const auto& map = mapOf(codecType);
    const auto it = map.find(config);
    return it == map.end() ? Param{} : it->second;
}

}  // namespace android
