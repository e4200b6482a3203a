// Camera configuration to capture size and encoder rate table, one per process.
#ifndef QUELLBORN_VTSP_CAMERACODECPARAMETER_H
#define QUELLBORN_VTSP_CAMERACODECPARAMETER_H

#include <cstdint>
#include <map>

namespace android {

class CameraCodecParameter {
public:
    enum CameraConfigEnum : int32_t {
        CAMERA_720P_30FPS = 0,
        CAMERA_VGA_REVERSED_15FPS = 1,
        CAMERA_VGA_REVERSED_30FPS = 2,
        CAMERA_QVGA_REVERSED_15FPS = 3,
        CAMERA_QVGA_REVERSED_30FPS = 4,
        CAMERA_CIF_30FPS = 5,
        CAMERA_QCIF_30FPS = 6,
        CAMERA_VGA_15FPS = 7,
        CAMERA_VGA_30FPS = 8,
        CAMERA_QVGA_15FPS = 9,
        CAMERA_QVGA_30FPS = 10,
    };

    enum CodecType : int32_t {
        CODEC_H264 = 0,
        CODEC_OTHER = 1,
    };

    struct Param {
        int32_t maxBitrate;
        int32_t minBitrate;
        int32_t bitrate;
        int32_t frameRate;
        int32_t width;
        int32_t height;
    };

    // Fills one codec type's map with its eleven rows; done once, before the
    // table is shared.
    void fill(CodecType codecType);

    // The row of `config` for `codecType`; a codec type other than
    // CODEC_OTHER reads the CODEC_H264 map. An unknown configuration answers
    // all zeros without touching the maps, so concurrent lookups from the
    // link's handling thread and binder threads never write shared state.
    Param getParameter(CameraConfigEnum config, CodecType codecType) const;

private:
    const std::map<CameraConfigEnum, Param>& mapOf(CodecType codecType) const;

    std::map<CameraConfigEnum, Param> mH264;
    std::map<CameraConfigEnum, Param> mOther;
};

}  // namespace android

#endif  // QUELLBORN_VTSP_CAMERACODECPARAMETER_H
