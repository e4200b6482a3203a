// One video RTP stream as the modem's commands describe it, and its twin
// stream in the media engine.
#ifndef QUELLBORN_VTSP_STREAMINFOMVD_H
#define QUELLBORN_VTSP_STREAMINFOMVD_H

#include <cstdint>
#include <memory>
#include <string>

#include "CameraCodecParameter.h"
#include "CmdBuffer.h"
#include "CmdCallback.h"
#include "Mvd.h"

namespace android {

// What the media engine was last told for a stream's rate: the codec's bit
// rate and the rate control's range (bit/s, frames/s); zeros before any.
struct StreamRateControl {
    int32_t bitrate = 0;
    int32_t minBitrate = 0;
    int32_t maxBitrate = 0;
    int32_t minFrameRate = 0;
    int32_t frameRate = 0;
};

// A copy of one stream's state, taken by its owner under the dispatcher's
// lock, that diagnostics read without touching the live stream.
struct StreamSnapshot {
    uint32_t streamId = 0;
    uint32_t mvdStreamId = 0;
    int32_t stat = 0;
    int32_t localAddrType = 0;
    char localIp[64] = {};
    uint16_t localPort = 0;
    int32_t remoteAddrType = 0;
    char remoteIp[64] = {};
    uint16_t remotePort = 0;
    int32_t payloadType = 0;
    StreamRateControl rate;
    int32_t rtcpMask = 0;
    int32_t orientationExtId = -1;  // -1: the extension was never set
    int32_t procStartCnt = 0;
    int32_t cameraConfig = 0;
    const char* captureId = nullptr;  // texts that live for the process
    const char* renderId = nullptr;
};

class StreamInfoMvd : public CmdCallback {
public:
    enum StreamStat : int32_t {
        STREAM_ENDED = 0,
        STREAM_SENDONLY = 1,
        STREAM_RECVONLY = 2,
        STREAM_SENDRECV = 3,
        STREAM_INACTIVE = 4,
    };

    // The RTCP feedback bits a stream keeps.
    static constexpr int32_t RTCP_FB_NACK = 0x10;
    static constexpr int32_t RTCP_FB_FIR = 0x40;
    static constexpr int32_t RTCP_FB_TMMBR = 0x80;
    static constexpr int32_t kRtcpFbKeptBits = RTCP_FB_NACK | RTCP_FB_FIR | RTCP_FB_TMMBR;
    // What a fresh engine stream is taken to do until told otherwise.
    static constexpr int32_t kInitialRtcpMask = RTCP_FB_NACK | RTCP_FB_FIR | RTCP_FB_TMMBR;

    // `captureId` is kept as a pointer: the text must outlive the stream.
    StreamInfoMvd(std::shared_ptr<CameraCodecParameter> table,
                  CameraCodecParameter::CameraConfigEnum config, const char* captureId);
    ~StreamInfoMvd() override;
    StreamInfoMvd(const StreamInfoMvd&) = delete;
    StreamInfoMvd& operator=(const StreamInfoMvd&) = delete;

    // CmdCallback
    CmdBuffer* parse(const CmdBuffer& cmd) override;
    void setCaptureId(const char* id) override;
    void setRenderId(const char* id) override;
    void setCodecParam(CameraCodecParameter::CameraConfigEnum config) override;
    void sendReplacedImage(bool start, const char* path) override;

    // Command handling (a start runs the modify handler with its extra step).
    CmdBuffer* commandStartHandler(const CmdBuffer& cmd);
    CmdBuffer* commandModifyHandler(const CmdBuffer& cmd);
    void configStreamDir(const CmdBuffer& cmd);
    CmdBuffer* commandEndHandler(const CmdBuffer& cmd);

    // Configuration steps.
    bool socketLocalParamConfig(const CmdBuffer& cmd);
    bool socketRemoteParamConfig(const CmdBuffer& cmd);
    bool setCodecType(unsigned int type);
    bool checkIfCodecParamUpdated(tagMVD_CODEC* codec, const CameraCodecParameter::Param& p);
    bool codecParamConfig(const CmdBuffer& cmd, int prevStat);
    bool rtcpParamConfig(const CmdBuffer& cmd, int prevStat);

    bool isAlive() const { return mStat != STREAM_ENDED; }
    // For the dispatcher, which holds its lock while it copies.
    StreamSnapshot snapshot() const;

    // Lifts a suspend of all engine streams that this stream caused.
    void resumeIfParamChanged();
    // Detaches the camera from the engine stream and stops its processing.
    void stopEngineStream();
    // Gives the engine stream back before a start opens another one, and
    // forgets what the old one was told so the new one is told all of it.
    void releaseEngineStream();

    static bool isActive(int32_t stat) {
        return stat == STREAM_SENDONLY || stat == STREAM_RECVONLY || stat == STREAM_SENDRECV;
    }
    static bool isReceiving(int32_t stat) {
        return stat == STREAM_RECVONLY || stat == STREAM_SENDRECV;
    }

    static constexpr size_t kIpFieldSize = 64;

    int32_t mStat;
    int32_t mLocalAddrType;
    int32_t mRemoteAddrType;
    char mLocalIp[kIpFieldSize];
    char mRemoteIp[kIpFieldSize];
    uint16_t mLocalPort;
    uint16_t mRemotePort;
    CameraCodecParameter::CodecType mCodecType;
    int32_t mPayloadType;
    uint32_t mStreamId;
    uint32_t mMvdStreamId;
    int32_t mProcStartCnt;
    const char* mCaptureId;
    const char* mRenderId;
    bool mParamChanged;
    int32_t mRTCPEnableMask;
    CameraCodecParameter::CameraConfigEnum mCameraConfig;
    std::shared_ptr<CameraCodecParameter> mCameraCodecParameter;
    // Remembered for diagnostics only: what the engine was given last.
    StreamRateControl mRateControl;
    int32_t mOrientationExtId = -1;
};

// Builds the bind request that tells the modem a stream's local end. The
// address is copied in host order; the link turns it to wire order.
CmdBuffer* BindToNet(const OSAL_NetAddress* addr, int streamId);

}  // namespace android

#endif  // QUELLBORN_VTSP_STREAMINFOMVD_H
