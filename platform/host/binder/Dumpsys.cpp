// The client side of the dump transaction, as dumpsys and libbinder's proxy
// send it, with a temporary file as the descriptor so that any amount of
// text fits without a reader running beside the call.
#include <binder/Parcel.h>
#include <unistd.h>
#include <utils/String16.h>

#include <cstdio>
#include <memory>

#include "HostBinder.h"

namespace hostbinder {

using android::Parcel;
using android::status_t;
using android::String16;

std::string dumpsys(const android::sp<android::IBinder>& service, const std::vector<std::string>& args,
                    status_t* status) {
    std::unique_ptr<FILE, int (*)(FILE*)> out(tmpfile(), fclose);
    status_t err = out == nullptr ? android::NO_MEMORY : android::NO_ERROR;
    std::string text;
    if (out != nullptr) {
        Parcel data;
        data.writeFileDescriptor(fileno(out.get()));
        data.writeInt32(static_cast<int32_t>(args.size()));
        for (const std::string& arg : args) data.writeString16(String16(arg.c_str()));
        Parcel reply;
        err = service->transact(android::IBinder::DUMP_TRANSACTION, data, &reply);
        char chunk[4096];
        ssize_t n;
        for (off_t at = 0; (n = pread(fileno(out.get()), chunk, sizeof(chunk), at)) > 0; at += n) {
            text.append(chunk, static_cast<size_t>(n));
        }
    }
    if (status != nullptr) *status = err;
    return text;
}

}  // namespace hostbinder
