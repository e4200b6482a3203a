// How a stream acts on the modem's commands: the step order of a start or
// modify, the direction state machine, and the end of a stream.
#include <android/log.h>

#include "StreamInfoMvd.h"

namespace android {

namespace {

constexpr const char* kTag = "CmdclbMVD";

#define LOGD(...) __android_log_print(ANDROID_LOG_DEBUG, kTag, __VA_ARGS__)
#define LOGE(...) __android_log_print(ANDROID_LOG_ERROR, kTag, __VA_ARGS__)

}  // namespace

CmdBuffer* StreamInfoMvd::parse(const CmdBuffer& cmd) {
    switch (cmd.command().code) {
        case _VTSP_CMD_CONFIG:
            LOGD("_VTSP_CMD_CONFIG");
            rtcpParamConfig(cmd, mStat);
            // A feedback change mid-call suspends every engine stream; lift it
            // now rather than at this stream's next modify, which may never come.
            resumeIfParamChanged();
            return nullptr;
        case _VTSP_CMD_STREAM_VIDEO_START:
            LOGD("_VTSP_CMD_STREAM_VIDEO_START");
            return commandStartHandler(cmd);
        case _VTSP_CMD_STREAM_VIDEO_MODITY:
            LOGD("_VTSP_CMD_STREAM_VIDEO_MODITY");
            return commandModifyHandler(cmd);
        case _VTSP_CMD_STREAM_VIDEO_END:
            LOGD("_VTSP_CMD_STREAM_VIDEO_END");
            commandEndHandler(cmd);
            return nullptr;
        default:
            return nullptr;
    }
}

CmdBuffer* StreamInfoMvd::commandStartHandler(const CmdBuffer& cmd) {
    return commandModifyHandler(cmd);
}

CmdBuffer* StreamInfoMvd::commandModifyHandler(const CmdBuffer& cmd) {
    int prevStat = mStat;
    CmdBuffer* reply = nullptr;
    if (!socketLocalParamConfig(cmd)) return reply;

    if (cmd.command().code == _VTSP_CMD_STREAM_VIDEO_START) {
        reply = BindToNet(&cmd.command().u.stmVideo.localAddr, static_cast<int>(mStreamId));
        if (mMvdStreamId != 0) {
            // Opening again would orphan the running engine stream with its
            // camera attached; the new one is not running, so configuring it
            // needs no suspend of the others.
            releaseEngineStream();
            prevStat = mStat;
        }
        if (Mvd_Open(mLocalIp, mLocalPort, &mMvdStreamId) != 0) {
            LOGE("%s: Failed to Mvd_open, ip:%s, port: %d", "commandModifyHandler", mLocalIp,
                 int(mLocalPort));
            mStat = STREAM_ENDED;
            return reply;  // the modem still learns the local end
        }
    }

    configStreamDir(cmd);
    if (!socketRemoteParamConfig(cmd)) return reply;

    const int named = Mvd_SetUniqueName(mMvdStreamId, mRenderId);
    LOGD("%s: Mvd_SetUniqueName(), streamId %d, renderid %s, ret %d", "commandModifyHandler",
         int(mMvdStreamId), mRenderId, named);

    if (!codecParamConfig(cmd, prevStat)) {
        // The engine may have refused the codec after every stream was
        // suspended for it; they go on with the codec they had.
        resumeIfParamChanged();
        return reply;
    }
    rtcpParamConfig(cmd, prevStat);

    // A suspend caused by this command's codec or RTCP step, or by a remote
    // port change, is lifted before the command ends.
    resumeIfParamChanged();

    if (isActive(mStat) && mProcStartCnt == 0) {
        const int started = Mvd_ProcStart(mMvdStreamId);
        ++mProcStartCnt;
        LOGD("%s: Mvd_ProcStart(%d), ret %d, cnt %d", "commandModifyHandler", int(mMvdStreamId),
             started, mProcStartCnt);
        const int attached = Mvd_CaptureAttach(mMvdStreamId, mCaptureId);
        LOGD("%s: Mvd_CaptureAttach(), streamId %d, ret %d", "commandModifyHandler",
             int(mMvdStreamId), attached);
    }
    return reply;
}

void StreamInfoMvd::configStreamDir(const CmdBuffer& cmd) {
    switch (cmd.command().u.stmVideo.dir) {
        case _VTSP_STREAM_DIR_ENDED:
            LOGD("%s", "<<<<<<<<<<<<<<_VTSP_STREAM_DIR_ENDED>>>>>>>>>>>>>>>>>");
            if (mMvdStreamId != 0 && mProcStartCnt > 0) {
                Mvd_ProcStop(mMvdStreamId);
                mProcStartCnt = 0;
            }
            mStat = STREAM_ENDED;
            break;
        case _VTSP_STREAM_DIR_INACTIVE:
            LOGD("%s", "<<<<<<<<<<<<<<<_VTSP_STREAM_DIR_INACTIVE>>>>>>>>>>>>>>>");
            if (mProcStartCnt > 0) {
                Mvd_ProcStop(mMvdStreamId);
                mProcStartCnt = 0;
            }
            mStat = STREAM_INACTIVE;
            break;
        case VTSP_STREAM_DIR_SENDONLY:
            LOGD("%s", "<<<<<<<<<<<<<<<VTSP_STREAM_DIR_SENDONLY>>>>>>>>>>>>>>>>>");
            if (mStat != STREAM_SENDONLY) {
                Mvd_TptSetSend(mMvdStreamId, 1);
                Mvd_TptSetRecv(mMvdStreamId, 0);
                mStat = STREAM_SENDONLY;
            }
            break;
        case VTSP_STREAM_DIR_RECVONLY:
            LOGD("%s", "<<<<<<<<<<<<<<<VTSP_STREAM_DIR_RECVONLY>>>>>>>>>>>>>>>>>>");
            if (mStat != STREAM_RECVONLY) {
                Mvd_TptSetSend(mMvdStreamId, 0);
                Mvd_TptSetRecv(mMvdStreamId, 1);
                mStat = STREAM_RECVONLY;
            }
            break;
        case VTSP_STREAM_DIR_SENDRECV:
            LOGD("%s", "<<<<<<<<<<<<<<<<VTSP_STREAM_DIR_SENDRECV>>>>>>>>>>>>>>>>>");
            if (mStat != STREAM_SENDRECV) {
                Mvd_TptSetSend(mMvdStreamId, 1);
                Mvd_TptSetRecv(mMvdStreamId, 1);
                mStat = STREAM_SENDRECV;
            }
            break;
        default:
            break;  // an unknown direction leaves the stream as it was
    }
}

CmdBuffer* StreamInfoMvd::commandEndHandler(const CmdBuffer& /*cmd*/) {
    mStat = STREAM_ENDED;
    stopEngineStream();
    return nullptr;
}

void StreamInfoMvd::stopEngineStream() {
    if (mMvdStreamId == 0) return;
    Mvd_CaptureDetach(mMvdStreamId);
    if (mProcStartCnt > 0) {
        Mvd_ProcStop(mMvdStreamId);
        mProcStartCnt = 0;
    }
}

void StreamInfoMvd::releaseEngineStream() {
    LOGD("%s: stream %d is open, Mvd_Close(%d) before opening again", "commandModifyHandler",
         int(mStreamId), int(mMvdStreamId));
    stopEngineStream();
    Mvd_Close(mMvdStreamId);
    mMvdStreamId = 0;
    mStat = STREAM_ENDED;
    mRemoteAddrType = 0;
    mRemotePort = 0;
    mRTCPEnableMask = kInitialRtcpMask;
    mRateControl = StreamRateControl{};
    mOrientationExtId = -1;
}

}  // namespace android
