// Arbitrary media engine event records into Mvd_EvntProc. No JVM is loaded,
// so the Java upcalls are skipped; the stream events reach a small observer.
#include <cstddef>
#include <cstdint>
#include <cstring>

#include "FuzzSupport.h"
#include "HostFakes.h"
#include "MmeEventObserver.h"
#include "MmeJni.h"
#include "Mvd.h"

using namespace android;

namespace {

class CountingObserver : public MmeEventObserver {
public:
    void mmeEvtUpdate(int event) override { sink += event; }
    int sink = 0;
};

CountingObserver observer;

}  // namespace

extern "C" int LLVMFuzzerInitialize(int* /*argc*/, char*** /*argv*/) {
    fuzzsupport::quietLog();
    registerMmeEventObserver(&observer);
    return 0;
}

// Input: one event record (missing words are zero), then the 4-byte cookie.
extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    tagMVD_EVNT event{};
    const size_t recordBytes = size < sizeof(event) ? size : sizeof(event);
    std::memcpy(&event, data, recordBytes);
    uint32_t cookie = 0;
    if (size >= sizeof(event) + sizeof(cookie)) {
        std::memcpy(&cookie, data + sizeof(event), sizeof(cookie));
    }
    hostfakes::reset();
    Mvd_EvntProc(&event, cookie);
    return 0;
}
