// The camera configuration table as the manager builds it: every row of both
// codec types, the capture sizes the engine reads, and unknown configurations.
#include <gtest/gtest.h>

#include <atomic>
#include <climits>
#include <thread>
#include <vector>

#include "CameraCodecParameter.h"
#include "VtspManager.h"

using namespace android;

namespace {

using Config = CameraCodecParameter::CameraConfigEnum;
using Codec = CameraCodecParameter::CodecType;
using Param = CameraCodecParameter::Param;

struct ExpectedRow {
    int32_t config;
    int32_t maxBitrate;
    int32_t minBitrateH264;
    int32_t minBitrateOther;
    int32_t bitrate;
    int32_t frameRate;
    int32_t width;
    int32_t height;
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

void expectParam(const ExpectedRow& row, int32_t minBitrate, const Param& p) {
    SCOPED_TRACE("configuration " + std::to_string(row.config));
    EXPECT_EQ(row.maxBitrate, p.maxBitrate);
    EXPECT_EQ(minBitrate, p.minBitrate);
    EXPECT_EQ(row.bitrate, p.bitrate);
    EXPECT_EQ(row.frameRate, p.frameRate);
    EXPECT_EQ(row.width, p.width);
    EXPECT_EQ(row.height, p.height);
}

bool allZero(const Param& p) {
    return p.maxBitrate == 0 && p.minBitrate == 0 && p.bitrate == 0 && p.frameRate == 0 &&
           p.width == 0 && p.height == 0;
}

}  // namespace

TEST(CameraCodecParameter, EveryRowOfBothCodecTypesAndTheCaptureSizes) {
    VtspManager link("/nonexistent");
    ASSERT_NE(nullptr, link.mCameraCodecParameter);
    const CameraCodecParameter& table = *link.mCameraCodecParameter;
    for (const ExpectedRow& row : kTable) {
        const Config config = static_cast<Config>(row.config);
        expectParam(row, row.minBitrateH264, table.getParameter(config, CameraCodecParameter::CODEC_H264));
        expectParam(row, row.minBitrateOther, table.getParameter(config, CameraCodecParameter::CODEC_OTHER));
        // Any codec type other than the second reads the first table.
        expectParam(row, row.minBitrateH264, table.getParameter(config, static_cast<Codec>(2)));

        VtspManager::CameraResolution r{-1, -1, -1};
        EXPECT_TRUE(link.getCameraResolution(config, r));
        EXPECT_EQ(row.width, r.width) << row.config;
        EXPECT_EQ(row.height, r.height) << row.config;
        EXPECT_EQ(row.frameRate, r.frameRate) << row.config;
    }
}

TEST(CameraCodecParameter, UnknownConfigurationsAnswerZerosEveryTime) {
    VtspManager link("/nonexistent");
    const CameraCodecParameter& table = *link.mCameraCodecParameter;
    for (int32_t key : {11, -1}) {
        const Config config = static_cast<Config>(key);
        for (int pass = 0; pass < 2; ++pass) {
            VtspManager::CameraResolution r{7, 7, 7};
            EXPECT_TRUE(link.getCameraResolution(config, r));
            EXPECT_EQ(0, r.width) << key;
            EXPECT_EQ(0, r.height) << key;
            EXPECT_EQ(0, r.frameRate) << key;
            EXPECT_TRUE(allZero(table.getParameter(config, CameraCodecParameter::CODEC_H264))) << key;
            EXPECT_TRUE(allZero(table.getParameter(config, CameraCodecParameter::CODEC_OTHER))) << key;
        }
    }
    // Asking for unknown keys leaves the known rows as they were.
    expectParam(kTable[10], kTable[10].minBitrateH264,
                table.getParameter(CameraCodecParameter::CAMERA_QVGA_30FPS, CameraCodecParameter::CODEC_H264));
}

TEST(CameraCodecParameter, ConcurrentLookupsOfUnknownAndKnownKeysStayCorrect) {
    VtspManager link("/nonexistent");
    const CameraCodecParameter& table = *link.mCameraCodecParameter;
    std::atomic<int> wrong{0};
    std::vector<std::thread> threads;
    for (int t = 0; t < 4; ++t) {
        threads.emplace_back([&, t] {
            const int32_t unknown[] = {11 + t, -1 - t, 1000 * (t + 1), INT_MIN + t};
            for (int i = 0; i < 2000; ++i) {
                const Config u = static_cast<Config>(unknown[i % 4]);
                const Codec codec = static_cast<Codec>(i % 3);
                if (!allZero(table.getParameter(u, codec))) ++wrong;
                VtspManager::CameraResolution r{1, 1, 1};
                if (!link.getCameraResolution(u, r) || r.width != 0 || r.height != 0 || r.frameRate != 0) {
                    ++wrong;
                }
                const ExpectedRow& row = kTable[i % 11];
                if (!link.getCameraResolution(static_cast<Config>(row.config), r) || r.width != row.width ||
                    r.height != row.height || r.frameRate != row.frameRate) {
                    ++wrong;
                }
            }
        });
    }
    for (auto& th : threads) th.join();
    EXPECT_EQ(0, wrong.load());
}
