// Arbitrary event numbers and JSON texts into the video library's listener,
// with an observer that takes whatever is forwarded.
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <string>

#include "FuzzSupport.h"
#include "HostFakes.h"
#include "ZmfEventObserver.h"

using namespace android;

namespace {

// Reads what it is given, so the sanitizers see any bad id pointer.
class TouchingObserver : public ZmfEventObserver {
public:
    void zmfRenderEvtUpdate(int event, const char* renderId, int sourceType, int width,
                            int height) override {
        sink += event + sourceType + width + height + touch(renderId);
    }
    void zmfCaptureEvtUpdate(int event, const char* captureId, int width, int height,
                             int frameRate) override {
        sink += event + width + height + frameRate + touch(captureId);
    }
    static size_t touch(const char* text) { return text != nullptr ? std::strlen(text) : 0; }
    size_t sink = 0;
};

TouchingObserver observer;

}  // namespace

extern "C" int LLVMFuzzerInitialize(int* /*argc*/, char*** /*argv*/) {
    fuzzsupport::quietLog();
    registerZmfEventObserver(&observer);
    return 0;
}

// Input: a 4-byte event number (little-endian), then the JSON text.
extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    if (size < 4) return 0;
    int32_t event = 0;
    std::memcpy(&event, data, sizeof(event));
    // The library hands out terminated texts; the copy gives the fuzzer's
    // bytes a terminator and an exact allocation for ASan to guard.
    const std::string json(reinterpret_cast<const char*>(data + 4), size - 4);
    hostfakes::reset();
    listen(event, json.c_str(), 0);
    return 0;
}
