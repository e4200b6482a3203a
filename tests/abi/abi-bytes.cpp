// Writes what the system puts on its wires for one fixed session, so that two
// builds (32-bit and 64-bit x86) can be compared byte for byte:
//   bind <hex>                 the bind request the link writes to the modem
//   dump <text>                the command dump line of the start command
//   parcel <code> <flags> <hex>  each notification the client's callback receives
// Exits 1, naming the step, if one of them never comes.
#include <android/log.h>

#include <chrono>
#include <cstdio>
#include <string>

#include "EngineHarness.h"
#include "Eventually.h"
#include "HostFakes.h"
#include "LogCapture.h"
#include "MmeEventObserver.h"
#include "VtspRecord.h"

using namespace android;
using namespace std::chrono_literals;

namespace {

constexpr uint32_t kSetSurface = 1, kSetCallback = 2, kEngineInit = 4, kRelease = 8, kCameraId = 9;
constexpr int32_t kRemoteView = 0;
constexpr int kRtpBreak = 22;
constexpr int kRemoteVideoSize = 27;

std::string hex(const void* bytes, size_t size) {
    static const char digits[] = "0123456789abcdef";
    std::string out;
    for (size_t i = 0; i < size; ++i) {
        const unsigned b = static_cast<const uint8_t*>(bytes)[i];
        out += digits[b >> 4];
        out += digits[b & 15];
    }
    return out;
}

std::string oneLine(std::string text) {
    for (char& c : text) c = c == '\n' ? '|' : c;
    return text;
}

int fail(const char* step) {
    fprintf(stderr, "abi-bytes: %s\n", step);
    return 1;
}

}  // namespace

int main() {
    LogCapture log;
    if (enginetest::service() == nullptr) return fail("no service");
    enginetest::call(kRelease);
    enginetest::call(kEngineInit, {0});
    const sp<hostbinder::RemoteBinder> client = enginetest::remoteCallback();
    enginetest::call(kSetCallback, {}, client);
    enginetest::call(kCameraId, {1});
    enginetest::call(kSetSurface, {kRemoteView}, enginetest::remoteProducer());

    // Every field of the start command set, IPv6 on one end so the swapped
    // groups and ports show too.
    vtspcodec::StreamCommand start;
    start.code = _VTSP_CMD_STREAM_VIDEO_START;
    start.streamId = 5;
    start.dir = VTSP_STREAM_DIR_SENDRECV;
    start.localAddr = vtspcodec::address("2001:db8::1", 6000);
    start.remoteAddr = vtspcodec::address("192.168.1.2", 5000);
    start.localControlPort = 6001;
    start.remoteControlPort = 5001;
    start.encodeType[0] = 97;
    start.localVideoAsBwKbps = 300;
    start.remoteVideoAsBwKbps = 400;
    start.extension = 3;
    start.extmapId = 4;
    start.extmapUri = "urn:3gpp:video-orientation";
    enginetest::modem().writeRecord(vtspcodec::streamRecord(start));
    VPR_Comm bind{};
    if (!enginetest::modem().readRecord(&bind)) return fail("no bind request");
    printf("bind %s\n", hex(&bind, sizeof(bind)).c_str());

    std::string dump;
    eventually([&] {
        for (const LogLine& line : log.linesWithTag("cmdbuffer")) {
            if (line.priority == ANDROID_LOG_INFO && line.text.rfind("VTSP Command:", 0) == 0) dump = line.text;
        }
        return !dump.empty();
    });
    if (dump.empty()) return fail("no command dump");
    printf("dump %s\n", oneLine(dump).c_str());

    MmeEventObserver* observer = m_pMmeEventObserver.load();
    if (observer == nullptr) return fail("no media engine observer");
    observer->mmeEvtUpdate(kRtpBreak);
    if (!hostfakes::fireZmfEvent(kRemoteVideoSize,
                                 R"({"Render":"Remote","SourceType":0,"Window":1,"Width":640,"Height":480})")) {
        return fail("no video library listener");
    }
    if (!client->waitForTransactions(2, 10s)) return fail("notifications missing");
    for (const auto& t : client->transactions()) {
        printf("parcel %u %u %s\n", t.code, t.flags, hex(t.data.data(), t.data.size()).c_str());
    }
    return 0;
}
