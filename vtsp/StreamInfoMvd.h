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

// A copy of one stream's state for diagnostics, taken while nothing else may
// change the stream.
struct StreamSnapshot {
    uint32_t streamId = 0;
    uint32_t mvdStreamId = 0;
    int32_t stat = 0;
    std::string localIp;
    uint16_t localPort = 0;
    std::string remoteIp;
    uint16_t remotePort = 0;
    int32_t payloadType = 0;
    int32_t bitrate = 0;     // of the codec last applied, bit/s; 0 before any
    int32_t minBitrate = 0;  // rate-control range last applied, bit/s
    int32_t maxBitrate = 0;
    int32_t rtcpMask = 0;
    int32_t orientationExtId = -1;  // -1: the video orientation extension is not set
    int32_t procStartCnt = 0;
    std::string captureId;
    std::string renderId;
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

    // What the engine stream was last given, for diagnostics.
    int32_t mBitrate = 0;
    int32_t mMinBitrate = 0;
    int32_t mMaxBitrate = 0;
    int32_t mOrientationExtId = -1;
};

// Builds the bind request that tells the modem a stream's local end. The
// address is copied in host order; the link turns it to wire order.
CmdBuffer* BindToNet(const OSAL_NetAddress* addr, int streamId);

}  // namespace android

#endif  // QUELLBORN_VTSP_STREAMINFOMVD_H
