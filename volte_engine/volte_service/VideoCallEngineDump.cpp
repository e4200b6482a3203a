#include "VideoCallEngineDump.h"


#include <cinttypes>
#include <cstdarg>
#include <cstdio>
#include <cstring>
#include <vector>

#include "VideoCallEngineImpl.h"
#include "VtspManager.h"

namespace android {

namespace {

struct Option {
    const char* name;
    unsigned section;
    const char* help;
};
constexpr Option kOptions[] = {
        {"--engine", VideoCallEngineDump::SECTION_ENGINE,
         "callback, camera, orientation and angles, surfaces, renders, hidden image, loopback"},
        {"--link", VideoCallEngineDump::SECTION_LINK, "modem pipe, threads, counters, queue depths"},
        {"--streams", VideoCallEngineDump::SECTION_STREAMS,
         "every stream: addresses, codec, rate control, RTCP feedback, extension"},
        {"--history", VideoCallEngineDump::SECTION_HISTORY, "the last commands from the modem and the replies"},
};
constexpr const char* kHelp = "-h";

void appendf(std::string& out, const char* format, ...) __attribute__((format(printf, 2, 3)));
void appendf(std::string& out, const char* format, ...) {
    char line[512];
    va_list ap;
    va_start(ap, format);
    const int n = vsnprintf(line, sizeof(line), format, ap);
    va_end(ap);
    if (n > 0) out.append(line, static_cast<size_t>(n) < sizeof(line) ? static_cast<size_t>(n) : sizeof(line) - 1);
}

const char* yesNo(bool value, const char* yes, const char* no) { return value ? yes : no; }

const char* directionName(int32_t stat) {
    static const char* const kNames[] = {"ended", "sendonly", "recvonly", "sendrecv", "inactive"};
    return stat >= 0 && stat < 5 ? kNames[stat] : "unknown";
}

const char* codeName(int32_t code) {
    switch (code) {
        case _VTSP_CMD_CONFIG: return "CONFIG";
        case _VTSP_CMD_STREAM_VIDEO_START: return "START";
        case _VTSP_CMD_STREAM_VIDEO_MODITY: return "MODIFY";
        case _VTSP_CMD_STREAM_VIDEO_END: return "END";
        default: return "code";
    }
}

// "10.0.0.1:6000", "[2001:db8:0:0:0:0:0:1]:6000" or "none".
std::string endpoint(int32_t type, const char* ip, uint16_t port) {
    if (type == 0) return "none";
    std::string out;
    appendf(out, type == 2 ? "[%s]:%u" : "%s:%u", ip, static_cast<unsigned>(port));
    return out;
}

std::string lastError(uint64_t failures, int err) {
    if (failures == 0) return "none";
    if (err == 0) return "end of file";
    std::string out;
    appendf(out, "errno %d, %s", err, strerror(err));
    return out;
}

std::string seconds(int64_t ms) {
    std::string out;
    appendf(out, "%" PRId64 ".%03" PRId64 " s", ms / 1000, ms % 1000);
    return out;
}

}  // namespace

VideoCallEngineDump::VideoCallEngineDump(const Vector<String16>& args) {
    // Compared as String16: every platform release has its equality.
    for (size_t i = 0; i < args.size(); ++i) {
        if (args[i] == String16(kHelp)) mHelp = true;
        for (const Option& option : kOptions) {
            if (args[i] == String16(option.name)) mSections |= option.section;
        }
    }
    if (mSections == 0) mSections = SECTION_ALL;
}

std::string VideoCallEngineDump::usage() {
    std::string out = "usage: dumpsys VideoCallEngineService [-h]";
    for (const Option& option : kOptions) appendf(out, " [%s]", option.name);
    out += "\n  no section named: every section\n";
    for (const Option& option : kOptions) appendf(out, "  %-10s %s\n", option.name, option.help);
    appendf(out, "  %-10s this text\n", kHelp);
    return out;
}

std::string VideoCallEngineDump::text(VideoCallEngineImpl* engine) const {
    if (mHelp) return usage();
    if (engine == nullptr) return "engine: none\n";
    std::string out;
    if (mSections & SECTION_ENGINE) appendEngine(out, *engine);
    if (mSections & SECTION_LINK) appendLink(out, *engine);
    if (mSections & SECTION_STREAMS) appendStreams(out, *engine);
    if (mSections & SECTION_HISTORY) appendHistory(out, *engine);
    return out;
}

void VideoCallEngineDump::appendEngine(std::string& out, VideoCallEngineImpl& engine) const {
    const VideoCallEngineImpl::Snapshot s = engine.snapshot(kEnginePatienceMs);
    out += "engine:\n";
    if (!s.callbackRead) {
        appendf(out, "  callback: not read, a notification held it for more than %d ms\n", kEnginePatienceMs);
    } else if (!s.callbackSet) {
        out += "  callback: none\n";
    } else {
        appendf(out, "  callback: registered, binder %s\n", yesNo(s.callbackAlive, "alive", "dead"));
    }
    if (!s.stateRead) {
        appendf(out, "  state: not read, an operation held the engine for more than %d ms\n", kEnginePatienceMs);
        return;
    }
    appendf(out, "  camera: id %d, open %d, handle 0x%" PRIx64 "\n", s.cameraId, s.openCameraId,
            static_cast<uint64_t>(s.captureHandle));
    if (s.cameraSize >= CameraCodecParameter::CAMERA_720P_30FPS &&
        s.cameraSize <= CameraCodecParameter::CAMERA_QVGA_30FPS) {
        VtspManager::CameraResolution size{};
        engine.mVtspManager->getCameraResolution(
                static_cast<CameraCodecParameter::CameraConfigEnum>(s.cameraSize), size);
        appendf(out, "  camera config: %d, preview size %dx%d at %d fps\n", s.cameraSize, size.width,
                size.height, size.frameRate);
    } else {
        appendf(out, "  camera config: %d, preview size not chosen\n", s.cameraSize);
    }
    appendf(out, "  orientation: device %d, screen %d, auto-rotate %d\n", s.deviceOrientation,
            s.screenOrientation, s.autoRotate);
    appendf(out, "  angles: camera %d, display %d, remote %d\n", s.cameraAngle, s.displayAngle,
            s.remoteRotation);
    appendf(out, "  surfaces: remote %s, preview %s\n", yesNo(s.remoteSurface, "set", "none"),
            yesNo(s.previewSurface, "set", "none"));
    std::string renders;
    if (s.remoteRenderStarted) appendf(renders, " \"%s\"", s.remoteRenderId);
    if (s.localRenderStarted) appendf(renders, " \"%s\"", s.localRenderId);
    appendf(out, "  renders:%s\n", renders.empty() ? " none" : renders.c_str());
    if (s.hiddenImage.empty()) {
        out += "  hidden image: none\n";
    } else {
        appendf(out, "  hidden image: \"%s\"\n", s.hiddenImage.c_str());
    }
    appendf(out, "  uplink qos: %d bit/s\n", s.uplinkQos);
    appendf(out, "  loopback: %s, stream %d\n", yesNo(s.loopback, "on", "off"), s.loopbackStream);
}

void VideoCallEngineDump::appendLink(std::string& out, VideoCallEngineImpl& engine) const {
    const VtspManager::LinkStatus l = engine.mVtspManager->linkStatus();
    out += "modem link:\n";
    appendf(out, "  device: %s, %s\n", l.devName, yesNo(l.deviceOpen, "open", "not open"));
    appendf(out, "  threads: tVtspCmdRx %s, tVtspCmdHd %s, tVtspCmdTx %s\n",
            yesNo(l.rxRunning, "running", "stopped"), yesNo(l.handleRunning, "running", "stopped"),
            yesNo(l.txRunning, "running", "stopped"));
    appendf(out, "  read: %" PRIu64 " records, %" PRIu64 " bytes, %" PRIu64 " failures, last error %s\n",
            l.recordsRead, l.bytesRead, l.readFailures, lastError(l.readFailures, l.lastReadErrno).c_str());
    appendf(out, "  written: %" PRIu64 " records, %" PRIu64 " bytes, %" PRIu64 " failures, last error %s\n",
            l.recordsWritten, l.bytesWritten, l.writeFailures,
            lastError(l.writeFailures, l.lastWriteErrno).c_str());
    appendf(out, "  retries: %" PRIu64 "\n", l.retries);
    appendf(out, "  refused while stopped: %" PRIu64 " commands, %" PRIu64 " replies\n", l.commandsRefused,
            l.repliesRefused);
    appendf(out, "  receive queue: %zu now, %zu at most\n", l.rxDepth.current, l.rxDepth.highest);
    appendf(out, "  transmit queue: %zu now, %zu at most\n", l.txDepth.current, l.txDepth.highest);
}

void VideoCallEngineDump::appendStreams(std::string& out, VideoCallEngineImpl& engine) const {
    const std::vector<StreamSnapshot> streams = engine.mVtspManager->mCmdCallback->publishedStreams();
    appendf(out, "streams: %zu\n", streams.size());
    for (const StreamSnapshot& s : streams) {
        appendf(out, "  stream %u:\n", s.streamId);
        appendf(out, "    media engine stream: %u\n", s.mvdStreamId);
        appendf(out, "    direction: %s (%d)\n", directionName(s.stat), s.stat);
        appendf(out, "    local: %s\n", endpoint(s.localAddrType, s.localIp, s.localPort).c_str());
        appendf(out, "    remote: %s\n", endpoint(s.remoteAddrType, s.remoteIp, s.remotePort).c_str());
        appendf(out, "    codec: H264, payload type %d, camera config %d\n", s.payloadType, s.cameraConfig);
        appendf(out, "    bit rate: %d, rate control %d..%d bit/s, %d..%d fps\n", s.rate.bitrate,
                s.rate.minBitrate, s.rate.maxBitrate, s.rate.minFrameRate, s.rate.frameRate);
        appendf(out, "    rtcp feedback: 0x%02x%s%s%s\n", static_cast<unsigned>(s.rtcpMask),
                yesNo(s.rtcpMask & StreamInfoMvd::RTCP_FB_NACK, " nack", ""),
                yesNo(s.rtcpMask & StreamInfoMvd::RTCP_FB_FIR, " fir", ""),
                yesNo(s.rtcpMask & StreamInfoMvd::RTCP_FB_TMMBR, " tmmbr", ""));
        if (s.orientationExtId < 0) {
            out += "    orientation extension: none\n";
        } else {
            appendf(out, "    orientation extension: id %d\n", s.orientationExtId);
        }
        appendf(out, "    processing starts: %d\n", s.procStartCnt);
        appendf(out, "    capture: \"%s\", render: \"%s\"\n", s.captureId != nullptr ? s.captureId : "",
                s.renderId != nullptr ? s.renderId : "");
    }
}

void VideoCallEngineDump::appendHistory(std::string& out, VideoCallEngineImpl& engine) const {
    CommandHistory& history = engine.mVtspManager->mHistory;
    const std::vector<CommandHistory::Entry> entries = history.entries();
    const uint64_t total = entries.empty() ? 0 : entries.back().number;
    appendf(out, "recent commands: %" PRIu64 " handled, last %zu shown, now %s\n", total, entries.size(),
            seconds(CommandHistory::monotonicMs()).c_str());
    for (const CommandHistory::Entry& e : entries) {
        appendf(out, "  #%" PRIu64 " %s %s %d, stream %u -> %s\n", e.number, seconds(e.monotonicMs).c_str(),
                codeName(e.code), e.code, e.streamId, e.reply);
    }
}

}  // namespace android
