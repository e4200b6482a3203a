#include "StreamInfoMvd.h"

#include <android/log.h>

#include <cstring>

namespace android {

namespace {

constexpr const char* kTag = "CmdclbMVD";
constexpr const char* kH264Name = "H264";
constexpr const char* kVideoOrientationUri = "urn:3gpp:video-orientation";
constexpr uint32_t kNoStream = 0xFFFFFFFFu;
constexpr uint32_t kKbps = 1024;

#define LOGD(...) __android_log_print(ANDROID_LOG_DEBUG, kTag, __VA_ARGS__)
#define LOGI(...) __android_log_print(ANDROID_LOG_INFO, kTag, __VA_ARGS__)
#define LOGE(...) __android_log_print(ANDROID_LOG_ERROR, kTag, __VA_ARGS__)

const char* text(const char* s) { return s != nullptr ? s : "(null)"; }

bool sameText(const char* a, const char* b) {
    return a != nullptr && b != nullptr && strcmp(a, b) == 0;
}

const VtspStmVideoView& stmVideo(const CmdBuffer& cmd) { return cmd.command().u.stmVideo; }

// Learns an end of the stream from a command address: 1 for IPv4, 2 for IPv6,
// 0 (and port 0, text untouched) when the address names neither.
void takeAddress(const OSAL_NetAddress& addr, int32_t& type, char* ip, uint16_t& port) {
    switch (addr.type) {
        case kAddrTypeIpv6:
        case kAddrTypeIpv6Alt:
            type = 2;
            ConvertIpToString(ip, addr.ipv6, false);
            port = addr.port;
            break;
        case kAddrTypeIpv4:
        case kAddrTypeIpv4Alt:
            type = 1;
            ConvertIpToString(ip, addr.ipv4, true);
            port = addr.port;
            break;
        default:
            type = 0;
            port = 0;
            break;
    }
}

}  // namespace

StreamInfoMvd::StreamInfoMvd(std::shared_ptr<CameraCodecParameter> table,
                             CameraCodecParameter::CameraConfigEnum config, const char* captureId)
        : mStat(STREAM_ENDED),
          mLocalAddrType(0),
          mRemoteAddrType(0),
          mLocalIp{},
          mRemoteIp{},
          mLocalPort(0),
          mRemotePort(0),
          mCodecType(CameraCodecParameter::CODEC_H264),
          mPayloadType(0),
          mStreamId(kNoStream),
          mMvdStreamId(0),
          mProcStartCnt(0),
          mCaptureId(captureId),
          mRenderId(kRemoteRenderName),
          mParamChanged(false),
          mRTCPEnableMask(kInitialRtcpMask),
          mCameraConfig(config),
          mCameraCodecParameter(std::move(table)) {}

StreamInfoMvd::~StreamInfoMvd() {
    if (mMvdStreamId != 0) {
        Mvd_Close(mMvdStreamId);
        LOGI("%s: Mvd_Close(%d), stat %d", "~StreamInfoMvd", int(mMvdStreamId), mStat);
    }
}

bool StreamInfoMvd::socketLocalParamConfig(const CmdBuffer& cmd) {
    const VtspStmVideoView& v = stmVideo(cmd);
    mStreamId = v.streamId;
    if (mLocalAddrType != 0 && mLocalPort != 0) return true;
    takeAddress(v.localAddr, mLocalAddrType, mLocalIp, mLocalPort);
    LOGD("local %s\\%d[%d]", mLocalIp, int(mLocalPort), mLocalAddrType);
    return mLocalAddrType != 0 && mLocalPort != 0;
}

bool StreamInfoMvd::socketRemoteParamConfig(const CmdBuffer& cmd) {
    const VtspStmVideoView& v = stmVideo(cmd);
    if (mRemoteAddrType != 0 && mRemotePort != 0) {
        if (v.remoteAddr.port == mRemotePort) return true;
        mParamChanged = true;
        mRemotePort = v.remoteAddr.port;
        const int ret = Mvd_SetRmtAddr(mMvdStreamId, mRemoteIp, mRemotePort);
        LOGD("%s: Port changed, Mvd_SetRmtAddr,port: %d, ret %d", "socketRemoteParamConfig",
             int(mRemotePort), ret);
        return true;
    }
    takeAddress(v.remoteAddr, mRemoteAddrType, mRemoteIp, mRemotePort);
    LOGD("remote %s\\%d[%d]", mRemoteIp, int(mRemotePort), mRemoteAddrType);
    if (mRemoteAddrType == 0 || mRemotePort == 0) return false;
    const int ret = Mvd_SetRmtAddr(mMvdStreamId, mRemoteIp, mRemotePort);
    LOGD("%s: Mvd_SetRmtAddr, ip:%s, port: %d, streamId %d, ret %d", "socketRemoteParamConfig",
         mRemoteIp, int(mRemotePort), int(mMvdStreamId), ret);
    return true;
}

bool StreamInfoMvd::setCodecType(unsigned int type) {
    if (type != CameraCodecParameter::CODEC_H264) {
        LOGD("codec type %d is not supported ", int(type));
        return false;
    }
    if (mCodecType != CameraCodecParameter::CODEC_H264) {
        LOGI("Codec Type is changed %d->%d", int(mCodecType), 0);
        mCodecType = CameraCodecParameter::CODEC_H264;
    }
    return true;
}

bool StreamInfoMvd::checkIfCodecParamUpdated(tagMVD_CODEC* codec,
                                             const CameraCodecParameter::Param& p) {
    if (mCodecType == CameraCodecParameter::CODEC_H264 &&
        Mvd_GetCdc(mMvdStreamId, kH264Name, codec) != 0) {
        LOGE("%s: GetCodec failed !!!", "checkIfCodecParamUpdated");
        return false;
    }
    int* w = codec->aiWord;
    if (w[MVD_CODEC_WORD_PAYLOAD] == mPayloadType && w[MVD_CODEC_WORD_BITRATE] == p.bitrate &&
        w[MVD_CODEC_WORD_FRAMERATE] == p.frameRate && w[MVD_CODEC_WORD_WIDTH] == p.width &&
        w[MVD_CODEC_WORD_HEIGHT] == p.height) {
        return false;
    }
    w[MVD_CODEC_WORD_PAYLOAD] = mPayloadType;
    w[MVD_CODEC_WORD_BITRATE] = p.bitrate;
    w[MVD_CODEC_WORD_FRAMERATE] = p.frameRate;
    w[MVD_CODEC_WORD_WIDTH] = p.width;
    w[MVD_CODEC_WORD_HEIGHT] = p.height;
    return true;
}

bool StreamInfoMvd::codecParamConfig(const CmdBuffer& cmd, int prevStat) {
    const VtspStmVideoView& v = stmVideo(cmd);
    if (v.encoder != 0) {
        LOGD("codec type %d is not supported ", int(v.encoder));
        return false;
    }
    setCodecType(CameraCodecParameter::CODEC_H264);
    const CameraCodecParameter::Param p =
            mCameraCodecParameter->getParameter(mCameraConfig, CameraCodecParameter::CODEC_H264);
    mPayloadType = static_cast<int32_t>(v.encodeType[v.encoder]);

    tagMVD_CODEC codec{};
    if (!checkIfCodecParamUpdated(&codec, p)) return true;

    mParamChanged = isActive(prevStat);
    if (mParamChanged) {
        LOGD("%s Mvd_SuspendAllStrm, codec params changed ", "codecParamConfig");
        Mvd_SuspendAllStrm();
    }
    Mvd_ArsSetEnable(mMvdStreamId, 1);

    // The local AS bandwidth caps the rate control; 0 (or a value that
    // overflows to 0) means no cap.
    const uint32_t cap = v.localVideoAsBwKbps * kKbps;
    const int32_t upper =
            cap >= 1 && cap <= static_cast<uint32_t>(p.maxBitrate) ? static_cast<int32_t>(cap)
                                                                   : p.maxBitrate;
    Mvd_ArsSetParm(mMvdStreamId, p.minBitrate, upper, (2 * p.frameRate) / 3, p.frameRate);
    mRateControl.minBitrate = p.minBitrate;
    mRateControl.maxBitrate = upper;
    mRateControl.minFrameRate = (2 * p.frameRate) / 3;
    mRateControl.frameRate = p.frameRate;

    if (Mvd_SetCdc(mMvdStreamId, &codec) != 0) {
        LOGE("%s: SetCodec failed !!!", "codecParamConfig");
        return false;
    }
    mRateControl.bitrate = p.bitrate;
    Mvd_SetSendPayload(mMvdStreamId, static_cast<unsigned char>(mPayloadType));
    const int* w = codec.aiWord;
    LOGD("%s: codec set payload %d, bitrate %d, fps %d, %d x %d, mCameraConfig %d",
         "codecParamConfig", w[MVD_CODEC_WORD_PAYLOAD], w[MVD_CODEC_WORD_BITRATE],
         w[MVD_CODEC_WORD_FRAMERATE], w[MVD_CODEC_WORD_WIDTH], w[MVD_CODEC_WORD_HEIGHT],
         int(mCameraConfig));
    return true;
}

bool StreamInfoMvd::rtcpParamConfig(const CmdBuffer& cmd, int prevStat) {
    const int32_t old = mRTCPEnableMask;
    const VtspConfigView& c = cmd.command().u.config;
    if (c.templCode == TEMPL_RTCP_FB && static_cast<uint16_t>(c.data[0]) == 1) {
        mRTCPEnableMask = c.data[2];
        LOGD("Recive RTCP mask %d", mRTCPEnableMask);
    }
    mRTCPEnableMask &= kRtcpFbKeptBits;
    LOGD("%s Recive RTCP mask, templCode: %d, data[0]: %d, data[2]: %d, mRTCPEnableMask: %d",
         "rtcpParamConfig", int(c.templCode), int(c.data[0]), int(c.data[2]), mRTCPEnableMask);

    const VtspStmVideoView& v = stmVideo(cmd);
    char uri[kExtmapUriSize + 1];
    copyExtmapUri(v, uri);
    LOGD("%sMvd_RtpSetExt, extension: %d, uri: %s, id: %d", "rtcpParamConfig", int(v.extension),
         uri, int(v.extmapId));
    if (strcmp(uri, kVideoOrientationUri) == 0) {
        Mvd_RtpSetExt(mMvdStreamId, MVD_RTP_EXT_VIDEO_ORIENTATION,
                      static_cast<unsigned char>(v.extmapId));
        mOrientationExtId = static_cast<unsigned char>(v.extmapId);
    }

    const int red = Mvd_RedSetEnable(mMvdStreamId, 0);
    LOGD("%s: Mvd_RedSetEnable(), ret %d", "rtcpParamConfig", red);

    if (mRTCPEnableMask == old) {
        LOGD("%s: return", "rtcpParamConfig");
        return true;
    }
    if (isActive(prevStat) && !mParamChanged) {
        mParamChanged = true;
        LOGD("%s Mvd_SuspendAllStrm, rtcp params changed ", "rtcpParamConfig");
        Mvd_SuspendAllStrm();
    }
    const int tmmbr = Mvd_TptEnableTmmbr(mMvdStreamId, (mRTCPEnableMask & RTCP_FB_TMMBR) ? 1 : 0);
    LOGD("%s: Mvd_TptEnableTmmbr(), ret %d", "rtcpParamConfig", tmmbr);
    const int nack = Mvd_TptEnableNack(mMvdStreamId, (mRTCPEnableMask & RTCP_FB_NACK) ? 1 : 0);
    LOGD("%s: Mvd_TptEnableNack(), ret %d", "rtcpParamConfig", nack);
    const int fir = Mvd_TptEnableFir(mMvdStreamId, (mRTCPEnableMask & RTCP_FB_FIR) ? 1 : 0);
    LOGD("%s: Mvd_TptEnableFir(), ret %d", "rtcpParamConfig", fir);
    return true;
}

void StreamInfoMvd::setCodecParam(CameraCodecParameter::CameraConfigEnum config) {
    mCameraConfig = config;
    const CameraCodecParameter::Param p = mCameraCodecParameter->getParameter(config, mCodecType);
    tagMVD_CODEC codec{};
    if (!checkIfCodecParamUpdated(&codec, p)) return;
    if (isActive(mStat)) {
        mParamChanged = true;
        LOGD("%s Mvd_SuspendAllStrm, codec params changed ", "setCodecParam");
        Mvd_SuspendAllStrm();
    } else {
        mParamChanged = false;
    }
    if (Mvd_SetCdc(mMvdStreamId, &codec) != 0) {
        LOGE("%s: SetCodec failed !!!", "setCodecParam");
    } else {
        mRateControl.bitrate = p.bitrate;
    }
    // Resumed even when the engine refused the codec: the streams then go on
    // with the codec they had, where waiting for the next modify of this
    // stream could leave every stream of the call frozen.
    resumeIfParamChanged();
}

StreamSnapshot StreamInfoMvd::snapshot() const {
    static_assert(sizeof(StreamSnapshot::localIp) == kIpFieldSize, "the snapshot holds a whole address text");
    StreamSnapshot s;
    s.streamId = mStreamId;
    s.mvdStreamId = mMvdStreamId;
    s.stat = mStat;
    s.localAddrType = mLocalAddrType;
    memcpy(s.localIp, mLocalIp, sizeof(s.localIp));
    s.localPort = mLocalPort;
    s.remoteAddrType = mRemoteAddrType;
    memcpy(s.remoteIp, mRemoteIp, sizeof(s.remoteIp));
    s.remotePort = mRemotePort;
    s.payloadType = mPayloadType;
    s.rate = mRateControl;
    s.rtcpMask = mRTCPEnableMask;
    s.orientationExtId = mOrientationExtId;
    s.procStartCnt = mProcStartCnt;
    s.cameraConfig = mCameraConfig;
    s.captureId = mCaptureId;
    s.renderId = mRenderId;
    return s;
}

void StreamInfoMvd::resumeIfParamChanged() {
    if (!mParamChanged) return;
    Mvd_ResumeAllStrm();
    mParamChanged = false;
}

void StreamInfoMvd::setCaptureId(const char* id) {
    if (id == nullptr || sameText(id, mCaptureId)) return;
    LOGD("%s: setCaptureId(), [%s] -> [%s]", "setCaptureId", text(mCaptureId), id);
    mCaptureId = id;
    if (mMvdStreamId != 0 && isActive(mStat)) Mvd_CaptureAttach(mMvdStreamId, id);
}

void StreamInfoMvd::setRenderId(const char* id) {
    if (id == nullptr || sameText(id, mRenderId)) return;
    mRenderId = id;
    if (mMvdStreamId != 0 && isReceiving(mStat)) Mvd_SetUniqueName(mMvdStreamId, id);
}

void StreamInfoMvd::sendReplacedImage(bool start, const char* path) {
    LOGI("%s, %s, path = %s", "sendReplacedImage", start ? "start" : "stop", text(path));
    if (mMvdStreamId == 0) {
        LOGD("%s no valid stream", "sendReplacedImage");
        return;
    }
    if (start) {
        Mvd_FileStartSendImage(mMvdStreamId, path);
    } else {
        Mvd_FileStopSendImage(mMvdStreamId);
    }
}

CmdBuffer* BindToNet(const OSAL_NetAddress* addr, int streamId) {
    VprNetBind body{};
    body.code = VPR_NET_CMD_BIND;
    body.streamId = streamId;
    memcpy(&body.addr, addr, sizeof(body.addr));
    return new CmdBuffer(VPR_COMM_NET, reinterpret_cast<const unsigned char*>(&body));
}

}  // namespace android
