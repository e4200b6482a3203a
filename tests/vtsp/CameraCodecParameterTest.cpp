// The camera configuration table as the manager builds it: every row of both
// codec types, the capture sizes the engine reads, and unknown configurations.
#include <gtest/gtest.h>

#include <array>
#include <climits>

#include "CameraCodecParameter.h"
#include "VtspManager.h"

using namespace android;

namespace {

using Config = CameraCodecParameter::CameraConfigEnum;
using Codec = CameraCodecParameter::CodecType;
using Values = std::array<int32_t, 6>;  // max, min, bit rate, frame rate, width, height
using Size = std::array<int32_t, 3>;    // width, height, frame rate

struct ExpectedRow {
    int32_t config, maxBitrate, minBitrateH264, minBitrateOther, bitrate, frameRate, width, height;
    Values with(int32_t minBitrate) const { return {maxBitrate, minBitrate, bitrate, frameRate, width, height}; }
    Size size() const { return {width, height, frameRate}; }
};

// Typed in from the product's rate table, not derived from the code.
constexpr ExpectedRow kTable[] = {
    {0, 4000000, 1200000, 1200000, 3000000, 30, 1280, 720},
    {1, 660000, 100000, 75000, 400000, 15, 480, 640},
    {2, 960000, 100000, 75000, 600000, 30, 480, 640},
    {3, 372000, 90000, 65000, 256000, 15, 240, 320},
    {4, 512000, 90000, 65000, 384000, 30, 240, 320},
    {5, 500000, 100000, 75000, 400000, 30, 352, 288},
    {6, 300000, 70000, 50000, 100000, 30, 176, 144},
    {7, 660000, 100000, 75000, 400000, 15, 640, 480},
    {8, 960000, 100000, 75000, 600000, 30, 640, 480},
    {9, 372000, 90000, 65000, 256000, 15, 320, 240},
    {10, 512000, 90000, 65000, 384000, 30, 320, 240},
};

Values lookup(const VtspManager& link, int32_t config, int codec) {
    const CameraCodecParameter::Param p =
            link.mCameraCodecParameter->getParameter(static_cast<Config>(config), static_cast<Codec>(codec));
    return {p.maxBitrate, p.minBitrate, p.bitrate, p.frameRate, p.width, p.height};
}

// The capture size as the manager answers it; all -2 if it refused.
Size captureSize(VtspManager& link, int32_t config) {
    VtspManager::CameraResolution r{-1, -1, -1};
    if (!link.getCameraResolution(static_cast<Config>(config), r)) return {-2, -2, -2};
    return {r.width, r.height, r.frameRate};
}

}  // namespace

TEST(CameraCodecParameter, EveryRowOfBothCodecTypesTheCaptureSizesAndUnknownConfigurations) {
    VtspManager link("/nonexistent");
    ASSERT_NE(nullptr, link.mCameraCodecParameter);
    for (const ExpectedRow& row : kTable) {
        SCOPED_TRACE("configuration " + std::to_string(row.config));
        EXPECT_EQ(row.with(row.minBitrateH264), lookup(link, row.config, CameraCodecParameter::CODEC_H264));
        EXPECT_EQ(row.with(row.minBitrateOther), lookup(link, row.config, CameraCodecParameter::CODEC_OTHER));
        // Any codec type other than the second reads the first table.
        EXPECT_EQ(row.with(row.minBitrateH264), lookup(link, row.config, 2));
        EXPECT_EQ(row.size(), captureSize(link, row.config));
    }
    // Unknown configurations answer zeros.
    for (int32_t unknown : {11, -1, 1000, INT_MIN}) {
        EXPECT_EQ(Values{}, lookup(link, unknown, CameraCodecParameter::CODEC_OTHER)) << unknown;
        EXPECT_EQ(Size{}, captureSize(link, unknown)) << unknown;
    }
}
