#include "EngineHarness.h"

#include <binder/IServiceManager.h>
#include <utils/String16.h>

#include <cstdlib>

#include "VideoCallEngineService.h"

using namespace android;

namespace enginetest {

ModemPty& modem() {
    // Lives for the process: the link keeps the device open until exit.
    static ModemPty* pty = [] {
        auto* p = new ModemPty();
        setenv("QUELLBORN_MODEM_PIPE", p->devicePath(), 1);
        return p;
    }();
    return *pty;
}

sp<IBinder> service() {
    static const bool registered = [] {
        modem();
        return VideoCallEngineService::instantiate() == NO_ERROR;
    }();
    if (!registered) return nullptr;
    return defaultServiceManager()->checkService(String16(VideoCallEngineService::kServiceName));
}

Reply call(uint32_t code, const Parcel& request) {
    Parcel reply;
    Reply out;
    out.status = service()->transact(code, request, &reply);
    out.size = reply.dataSize();
    reply.setDataPosition(0);
    out.value = reply.readInt32();
    return out;
}

Reply call(uint32_t code, std::initializer_list<int32_t> ints, const sp<IBinder>& binder,
           const char* text) {
    Parcel request;
    for (int32_t v : ints) request.writeInt32(v);
    if (binder != nullptr) request.writeStrongBinder(binder);
    if (text != nullptr) request.writeCString(text);
    return call(code, request);
}

sp<hostbinder::RemoteBinder> remoteCallback() {
    return new hostbinder::RemoteBinder(
            [](uint32_t, const Parcel&, Parcel* reply, uint32_t) {
                reply->writeInt32(0);
                return NO_ERROR;
            },
            String16("android.videocallengine.callback"));
}

sp<hostbinder::RemoteBinder> remoteProducer() {
    return new hostbinder::RemoteBinder({}, String16("android.gui.IGraphicBufferProducer"));
}

}  // namespace enginetest
