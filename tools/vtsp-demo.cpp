// A small demonstration of the modem path on the host: a pseudo-terminal
// stands in for the modem pipe, the real link reads a start, a modify and an
// end record from it, the media engine stand-in prints every call it gets,
// and the bind request the link writes back is decoded.
//
//   vtsp-demo [-v]     -v also prints the system's log lines (stderr)
#include <android/log.h>

#include <chrono>
#include <cstdio>
#include <cstring>
#include <string>
#include <thread>

#include "HostFakes.h"
#include "ModemPty.h"
#include "VtspManager.h"
#include "VtspRecord.h"

using namespace android;
using namespace vtspcodec;

namespace {

bool waitForCall(const std::string& name, size_t from) {
    const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(5);
    while (std::chrono::steady_clock::now() < deadline) {
        const std::vector<hostfakes::Call> calls = hostfakes::calls();
        for (size_t i = from; i < calls.size(); ++i) {
            if (calls[i].name == name) return true;
        }
        std::this_thread::sleep_for(std::chrono::milliseconds(10));
    }
    return false;
}

void say(const char* text) {
    printf("\n== %s\n", text);
    fflush(stdout);
}

}  // namespace

int main(int argc, char** argv) {
    const bool verbose = argc > 1 && strcmp(argv[1], "-v") == 0;
    __android_log_set_minimum_priority(verbose ? ANDROID_LOG_DEBUG : ANDROID_LOG_FATAL);
    hostfakes::setTrace("stdout");

    ModemPty modem;
    VtspManager link(modem.devicePath());
    link.init();
    printf("link running on %s (standing in for %s)\n", modem.devicePath(), kModemPipePath);

    StreamCommand start;
    start.code = _VTSP_CMD_STREAM_VIDEO_START;
    start.streamId = 1;
    start.dir = VTSP_STREAM_DIR_SENDRECV;
    start.encodeType[0] = 96;
    start.localAddr = address("10.0.0.1", 6000);
    start.remoteAddr = address("192.168.1.2", 5000);
    start.localVideoAsBwKbps = 500;
    start.extmapId = 3;
    start.extmapUri = "urn:3gpp:video-orientation";

    say("modem -> link: START stream 1, sendrecv, 10.0.0.1:6000 <-> 192.168.1.2:5000, PT 96, AS 500 kbps");
    modem.writeRecord(streamRecord(start));
    VPR_Comm reply{};
    if (!modem.readRecord(&reply)) {
        fprintf(stderr, "vtsp-demo: no bind request came back\n");
        link.destroy();
        return 1;
    }
    const BindRequest bind = readBindRequest(reply);
    printf("link -> modem: BIND code %u stream %d address %s port %u (targetModule %u, recordLength %u)\n",
           bind.code, bind.streamId, addressText(bind.addr).c_str(), unsigned(bind.addr.port),
           bind.targetModule, bind.recordLength);

    StreamCommand hold = start;
    hold.code = _VTSP_CMD_STREAM_VIDEO_MODITY;
    hold.dir = _VTSP_STREAM_DIR_INACTIVE;
    say("modem -> link: MODIFY stream 1, inactive (hold)");
    size_t mark = hostfakes::callCount();
    modem.writeRecord(streamRecord(hold));
    const bool held = waitForCall("Mvd_ProcStop", mark);

    StreamCommand end = start;
    end.code = _VTSP_CMD_STREAM_VIDEO_END;
    say("modem -> link: END stream 1");
    mark = hostfakes::callCount();
    modem.writeRecord(streamRecord(end));
    const bool closed = waitForCall("Mvd_Close", mark);

    link.destroy();
    say(held && closed ? "call played through; link destroyed" : "call did not complete");
    return held && closed ? 0 : 1;
}
