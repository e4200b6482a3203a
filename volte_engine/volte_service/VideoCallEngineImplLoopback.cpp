// Loopback mode: one media engine stream of the engine's own that sends the
// camera picture to 127.0.0.1 and draws what it receives in the remote render.
#include <android/log.h>

#include "VideoCallEngineImpl.h"
#include "VtspManager.h"

namespace android {

namespace {

constexpr const char* kTag = "VideoCallEngineImpl";

#define LOGI(...) __android_log_print(ANDROID_LOG_INFO, kTag, __VA_ARGS__)
#define LOGE(...) __android_log_print(ANDROID_LOG_ERROR, kTag, __VA_ARGS__)

constexpr const char* kLoopbackAddress = "127.0.0.1";
constexpr unsigned short kLoopbackPort = 5060;
constexpr int kMinBitrate = 500000;
constexpr int kMaxBitrate = 1200000;
constexpr int kMinFrameRate = 20;
constexpr int kMaxFrameRate = 30;
constexpr int kPayloadType = 121;
constexpr int kBitrate = 600000;
constexpr unsigned char kOrientationExtId = 1;

}  // namespace

void VideoCallEngineImpl::startLoopBack() {
    std::lock_guard<std::recursive_mutex> op(mOpLock);
    LOGI("%s", "startLoopBack");
    unsigned int stream = 0;
    Mvd_Open(kLoopbackAddress, kLoopbackPort, &stream);
    mLoopbackStream = static_cast<int>(stream);
    if (mLoopbackStream == 0) {
        // Configuring stream 0 would only send the engine calls about a
        // stream that does not exist.
        LOGE("create stream failed");
        return;
    }
    Mvd_SetRmtAddr(stream, kLoopbackAddress, kLoopbackPort);
    Mvd_SetUniqueName(stream, mRemoteRenderId);
    Mvd_ArsSetEnable(stream, 1);
    Mvd_ArsSetParm(stream, kMinBitrate, kMaxBitrate, kMinFrameRate, kMaxFrameRate);

    tagMVD_CODEC codec{};
    if (Mvd_GetCdc(stream, "H264", &codec) == 0) {
        codec.aiWord[MVD_CODEC_WORD_PAYLOAD] = kPayloadType;
        codec.aiWord[MVD_CODEC_WORD_BITRATE] = kBitrate;
        if (mCameraSize < 0) mCameraSize = getCameraSizeFromQos();
        VtspManager::CameraResolution resolution{};
        mVtspManager->getCameraResolution(
                static_cast<CameraCodecParameter::CameraConfigEnum>(mCameraSize), resolution);
        codec.aiWord[MVD_CODEC_WORD_WIDTH] = resolution.width;
        codec.aiWord[MVD_CODEC_WORD_HEIGHT] = resolution.height;
        codec.aiWord[MVD_CODEC_WORD_FRAMERATE] = resolution.frameRate;
        Mvd_SetCdc(stream, &codec);
    }
    Mvd_RedSetEnable(stream, 0);
    // The loopback's own payload type, whatever the engine's record says when
    // it could not be read.
    if (Mvd_SetSendPayload(stream, kPayloadType) != 0) LOGE("SetSendPayload failed");
    Mvd_TptSetSend(stream, 1);
    Mvd_TptSetRecv(stream, 1);
    Mvd_RtpSetExt(stream, MVD_RTP_EXT_VIDEO_ORIENTATION, kOrientationExtId);
    if (Mvd_ProcStart(stream) != 0) LOGE("ProcStart failed");
    if (mCaptureHandle != 0 && mOpenCameraId != -1) {
        Mvd_CaptureAttach(stream, captureName(mOpenCameraId));
    }
}

void VideoCallEngineImpl::stopLoopBack() {
    std::lock_guard<std::recursive_mutex> op(mOpLock);
    LOGI("%s", "stopLoopBack");
    // Once closed, the id may be handed to another stream (a modem call's):
    // it is forgotten so that a second release cannot close that stream.
    if (mLoopbackStream == 0) return;
    Mvd_ProcStop(static_cast<unsigned int>(mLoopbackStream));
    Mvd_Close(static_cast<unsigned int>(mLoopbackStream));
    mLoopbackStream = 0;
}

}  // namespace android
