#include "EngineHarness.h"

#include <binder/IServiceManager.h>
#include <utils/String16.h>

#include <algorithm>
#include <cstdlib>
#include <cstring>

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

std::string describe(uint32_t code, const uint8_t* bytes, size_t size, uint32_t flags) {
    std::string out = "code " + std::to_string(code) + " flags " + std::to_string(flags) + ":";
    for (size_t at = 0; at + sizeof(int32_t) <= size; at += sizeof(int32_t)) {
        int32_t v;
        memcpy(&v, bytes + at, sizeof(v));
        out += " " + std::to_string(v);
    }
    if (size % sizeof(int32_t) != 0) out += " +" + std::to_string(size % sizeof(int32_t)) + " bytes";
    return out;
}

std::vector<std::string> received(const hostbinder::RemoteBinder& client) {
    std::vector<std::string> out;
    for (const auto& t : client.transactions()) out.push_back(describe(t.code, t.data.data(), t.data.size(), t.flags));
    return out;
}

::testing::AssertionResult inOrder(const std::vector<std::string>& all, std::initializer_list<std::string> texts) {
    auto from = all.begin();
    for (const std::string& text : texts) {
        const auto it = std::find(from, all.end(), text);
        if (it == all.end()) {
            ::testing::AssertionResult failure = ::testing::AssertionFailure();
            failure << "\"" << text << "\" missing or out of order in:";
            for (const std::string& line : all) failure << "\n  " << line;
            return failure;
        }
        from = it + 1;
    }
    return ::testing::AssertionSuccess();
}

}  // namespace enginetest
