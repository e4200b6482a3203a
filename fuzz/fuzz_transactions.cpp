// Arbitrary transaction codes and request bytes into the binder service. One
// service object lives for the process, as on the device, so a sequence of
// inputs drives one engine through whatever states the codes reach.
#include <binder/Parcel.h>
#include <utils/StrongPointer.h>

#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>

#include "FuzzSupport.h"
#include "HostFakes.h"
#include "VideoCallEngineService.h"

using namespace android;

namespace {

VideoCallEngineService* theService() {
    // Held for the process: the engine and its link are process singletons.
    static sp<VideoCallEngineService> service = new VideoCallEngineService();
    return service.get();
}

// libbinder's dump reader adds an empty argument for every count it cannot
// read, so a count of a billion costs gigabytes before the service sees a
// single argument: the platform's own loop, the same on a handset, where
// only the privileged dumpsys sends this transaction.
bool dumpArgumentsBeyondTheBytes(const Parcel& request) {
    request.readFileDescriptor();
    const int32_t argc = request.readInt32();
    const bool beyond = argc > 0 && static_cast<size_t>(argc) > request.dataAvail() / sizeof(int32_t);
    request.setDataPosition(0);
    return beyond;
}

}  // namespace

extern "C" int LLVMFuzzerInitialize(int* /*argc*/, char*** /*argv*/) {
    fuzzsupport::quietLog();
    // The link's threads read and write this instead of a modem: reads end
    // at once and are retried after the link's pause, so they never spin.
    setenv("QUELLBORN_MODEM_PIPE", "/dev/null", 1);
    theService();
    return 0;
}

// Input: a 4-byte transaction code (little-endian), then the request's bytes.
extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    if (size < 4) return 0;
    uint32_t code = 0;
    std::memcpy(&code, data, sizeof(code));
    Parcel request;
    request.setData(data + 4, size - 4);
    if (code == IBinder::DUMP_TRANSACTION && dumpArgumentsBeyondTheBytes(request)) return 0;
    Parcel reply;
    hostfakes::reset();
    theService()->onTransact(code, request, &reply, 0);
    return 0;
}
