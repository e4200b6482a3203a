// Recording stand-in for the media engine's video API.
//
// It keeps just enough state to behave like the engine toward the system:
// Mvd_Open hands out stream ids, each open stream has a codec record that
// Mvd_GetCdc reports and Mvd_SetCdc replaces, and calls naming a stream that
// is not open fail where the engine would need the stream's state.
#include <map>
#include <set>

#include "CallRecorder.h"
#include "Mvd.h"

namespace hostfakes {
namespace {

constexpr int kFail = -1;

struct MvdState {
    unsigned int nextId = 1;
    std::map<unsigned int, tagMVD_CODEC> streams;
    std::map<unsigned int, tagMVD_RTCP_STA> stats;
    std::set<unsigned int> suspended;
    PFN_MVDEVNTPROC eventProc = nullptr;
};

MvdState& state() {
    static MvdState* s = [] {
        auto* fresh = new MvdState();
        CallRecorder::instance().addResetHook([fresh] {
            std::lock_guard<std::mutex> lock(CallRecorder::instance().stateMutex());
            *fresh = MvdState();
        });
        return fresh;
    }();
    return *s;
}

// A freshly opened stream's codec: the engine's H.264 defaults, with the
// words the system never touches holding recognisable values so a test can
// see that they come back unchanged.
tagMVD_CODEC defaultCodec() {
    tagMVD_CODEC codec{};
    for (int i = 0; i < MVD_CODEC_WORDS; ++i) codec.aiWord[i] = 1000 + i;
    codec.aiWord[MVD_CODEC_WORD_PAYLOAD] = 0;
    codec.aiWord[MVD_CODEC_WORD_BITRATE] = 0;
    codec.aiWord[MVD_CODEC_WORD_FRAMERATE] = 0;
    codec.aiWord[MVD_CODEC_WORD_WIDTH] = 0;
    codec.aiWord[MVD_CODEC_WORD_HEIGHT] = 0;
    return codec;
}

int onStream(const char* function, unsigned int id, std::vector<std::string> extra = {}) {
    std::vector<std::string> args{argText(id)};
    for (auto& a : extra) args.push_back(std::move(a));
    return recordCall(function, std::move(args));
}

}  // namespace

void setNextMvdStreamId(unsigned int id) {
    std::lock_guard<std::mutex> lock(CallRecorder::instance().stateMutex());
    state().nextId = id;
}

void setMvdCodec(unsigned int streamId, const tagMVD_CODEC& codec) {
    std::lock_guard<std::mutex> lock(CallRecorder::instance().stateMutex());
    state().streams[streamId] = codec;
}

bool getMvdCodec(unsigned int streamId, tagMVD_CODEC* codec) {
    std::lock_guard<std::mutex> lock(CallRecorder::instance().stateMutex());
    const auto it = state().streams.find(streamId);
    if (it == state().streams.end()) return false;
    *codec = it->second;
    return true;
}

void setRtcpStats(unsigned int streamId, const tagMVD_RTCP_STA& stats) {
    std::lock_guard<std::mutex> lock(CallRecorder::instance().stateMutex());
    state().stats[streamId] = stats;
}

int fireMvdEvent(const tagMVD_EVNT& event) {
    PFN_MVDEVNTPROC proc;
    {
        std::lock_guard<std::mutex> lock(CallRecorder::instance().stateMutex());
        proc = state().eventProc;
    }
    if (proc == nullptr) return kNotInstalled;
    return runOnEngineThread([proc, event] {
        tagMVD_EVNT copy = event;
        return proc(&copy, 0);
    });
}

std::vector<unsigned int> openMvdStreams() {
    std::lock_guard<std::mutex> lock(CallRecorder::instance().stateMutex());
    std::vector<unsigned int> ids;
    for (const auto& entry : state().streams) ids.push_back(entry.first);
    return ids;
}

std::vector<unsigned int> suspendedMvdStreams() {
    std::lock_guard<std::mutex> lock(CallRecorder::instance().stateMutex());
    return std::vector<unsigned int>(state().suspended.begin(), state().suspended.end());
}

}  // namespace hostfakes

using namespace hostfakes;

extern "C" {

int Mvd_Open(const char* pcLocalAddr, unsigned short wLocalPort, unsigned int* piStrmId) {
    CallRecorder& r = CallRecorder::instance();
    const int result = r.resultFor("Mvd_Open", 0);
    long long id = 0;
    if (result == 0 && piStrmId != nullptr) {
        std::lock_guard<std::mutex> lock(r.stateMutex());
        id = state().nextId++;
        state().streams[static_cast<unsigned int>(id)] = defaultCodec();
        *piStrmId = static_cast<unsigned int>(id);
    }
    return r.record("Mvd_Open", {argText(pcLocalAddr), argText(wLocalPort), outText(id)}, result);
}

int Mvd_Close(unsigned int iStrmId) {
    CallRecorder& r = CallRecorder::instance();
    {
        std::lock_guard<std::mutex> lock(r.stateMutex());
        state().streams.erase(iStrmId);
        state().suspended.erase(iStrmId);
    }
    return onStream("Mvd_Close", iStrmId);
}

int Mvd_SetRmtAddr(unsigned int iStrmId, const char* pcRmtAddr, unsigned short wRmtPort) {
    return onStream("Mvd_SetRmtAddr", iStrmId, {argText(pcRmtAddr), argText(wRmtPort)});
}

int Mvd_SetUniqueName(unsigned int iStrmId, const char* pcName) {
    return onStream("Mvd_SetUniqueName", iStrmId, {argText(pcName)});
}

int Mvd_GetCdc(unsigned int iStrmId, const char* pcCdcName, tagMVD_CODEC* pstCdc) {
    CallRecorder& r = CallRecorder::instance();
    tagMVD_CODEC codec{};
    const bool known = getMvdCodec(iStrmId, &codec);
    const int result = r.resultFor("Mvd_GetCdc", known ? 0 : kFail);
    if (result == 0 && pstCdc != nullptr) *pstCdc = codec;
    return r.record("Mvd_GetCdc",
                    {argText(iStrmId), argText(pcCdcName), result == 0 ? codecText(&codec) : "out=-"},
                    result);
}

int Mvd_SetCdc(unsigned int iStrmId, tagMVD_CODEC* pstCdc) {
    CallRecorder& r = CallRecorder::instance();
    tagMVD_CODEC ignored{};
    const bool known = getMvdCodec(iStrmId, &ignored);
    const int result = r.resultFor("Mvd_SetCdc", known && pstCdc != nullptr ? 0 : kFail);
    if (result == 0) setMvdCodec(iStrmId, *pstCdc);
    return r.record("Mvd_SetCdc", {argText(iStrmId), codecText(pstCdc)}, result);
}

int Mvd_SetSendPayload(unsigned int iStrmId, unsigned char ucPayload) {
    return onStream("Mvd_SetSendPayload", iStrmId, {argText(ucPayload)});
}

int Mvd_ArsSetEnable(unsigned int iStrmId, int bEnable) {
    return onStream("Mvd_ArsSetEnable", iStrmId, {argText(bEnable)});
}

int Mvd_ArsSetParm(unsigned int iStrmId, int iMinBitRate, int iMaxBitRate, int iMinFrameRate,
                   int iFrameRate) {
    return onStream("Mvd_ArsSetParm", iStrmId,
                    {argText(iMinBitRate), argText(iMaxBitRate), argText(iMinFrameRate),
                     argText(iFrameRate)});
}

int Mvd_SuspendAllStrm(void) {
    const int result = recordCall("Mvd_SuspendAllStrm", {});
    if (result == 0) {
        std::lock_guard<std::mutex> lock(CallRecorder::instance().stateMutex());
        for (const auto& entry : state().streams) state().suspended.insert(entry.first);
    }
    return result;
}

int Mvd_ResumeAllStrm(void) {
    const int result = recordCall("Mvd_ResumeAllStrm", {});
    if (result == 0) {
        std::lock_guard<std::mutex> lock(CallRecorder::instance().stateMutex());
        state().suspended.clear();
    }
    return result;
}

int Mvd_TptEnableTmmbr(unsigned int iStrmId, int bEnable) {
    return onStream("Mvd_TptEnableTmmbr", iStrmId, {argText(bEnable)});
}

int Mvd_TptEnableNack(unsigned int iStrmId, int bEnable) {
    return onStream("Mvd_TptEnableNack", iStrmId, {argText(bEnable)});
}

int Mvd_TptEnableFir(unsigned int iStrmId, int bEnable) {
    return onStream("Mvd_TptEnableFir", iStrmId, {argText(bEnable)});
}

int Mvd_RtpSetExt(unsigned int iStrmId, int iExtType, unsigned char ucExtId) {
    return onStream("Mvd_RtpSetExt", iStrmId, {argText(iExtType), argText(ucExtId)});
}

int Mvd_RedSetEnable(unsigned int iStrmId, int bEnable) {
    return onStream("Mvd_RedSetEnable", iStrmId, {argText(bEnable)});
}

int Mvd_TptSetSend(unsigned int iStrmId, int bEnable) {
    return onStream("Mvd_TptSetSend", iStrmId, {argText(bEnable)});
}

int Mvd_TptSetRecv(unsigned int iStrmId, int bEnable) {
    return onStream("Mvd_TptSetRecv", iStrmId, {argText(bEnable)});
}

int Mvd_ProcStart(unsigned int iStrmId) { return onStream("Mvd_ProcStart", iStrmId); }
int Mvd_ProcStop(unsigned int iStrmId) { return onStream("Mvd_ProcStop", iStrmId); }

int Mvd_CaptureAttach(unsigned int iStrmId, const char* pcCaptureName) {
    return onStream("Mvd_CaptureAttach", iStrmId, {argText(pcCaptureName)});
}

int Mvd_CaptureDetach(unsigned int iStrmId) { return onStream("Mvd_CaptureDetach", iStrmId); }

int Mvd_FileStartSendImage(unsigned int iStrmId, const char* pcFilePath) {
    return onStream("Mvd_FileStartSendImage", iStrmId, {argText(pcFilePath)});
}

int Mvd_FileStopSendImage(unsigned int iStrmId) {
    return onStream("Mvd_FileStopSendImage", iStrmId);
}

int Mvd_TaskStart(void) { return recordCall("Mvd_TaskStart", {}); }
int Mvd_TaskStop(void) { return recordCall("Mvd_TaskStop", {}); }

int Mvd_EvntSetCallback(PFN_MVDEVNTPROC pfnProc, int bEnable) {
    const int result = recordCall("Mvd_EvntSetCallback",
                                  {pfnProc != nullptr ? "proc" : "NULL", argText(bEnable)});
    if (result == 0) {
        std::lock_guard<std::mutex> lock(CallRecorder::instance().stateMutex());
        state().eventProc = pfnProc;
    }
    return result;
}

int Mvd_RtcpGetSta(unsigned int iStrmId, tagMVD_RTCP_STA* pstSta) {
    tagMVD_RTCP_STA stats{};
    bool known;
    {
        std::lock_guard<std::mutex> lock(CallRecorder::instance().stateMutex());
        const auto it = state().stats.find(iStrmId);
        known = it != state().stats.end();
        if (known) stats = it->second;
    }
    const int result = CallRecorder::instance().resultFor("Mvd_RtcpGetSta", known ? 0 : kFail);
    if (result == 0 && pstSta != nullptr) *pstSta = stats;
    return CallRecorder::instance().record("Mvd_RtcpGetSta", {argText(iStrmId)}, result);
}

}  // extern "C"
