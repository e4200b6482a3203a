// What engine tests share: a process-wide pseudo-terminal standing in for the
// modem pipe (put in place before the engine first starts the link), the
// registered service as a client sees it, and client-side binder objects.
#ifndef QUELLBORN_TESTS_ENGINEHARNESS_H
#define QUELLBORN_TESTS_ENGINEHARNESS_H

#include <binder/IBinder.h>
#include <binder/Parcel.h>
#include <utils/StrongPointer.h>

#include <gtest/gtest.h>

#include <initializer_list>
#include <string>
#include <vector>

#include "ModemPty.h"
#include "RemoteBinder.h"

namespace enginetest {

// The modem's end of the pipe the engine's link uses in this process.
ModemPty& modem();

// Registers the service (once per process) and looks it up as a client would.
android::sp<android::IBinder> service();

struct Reply {
    android::status_t status = 0;
    int32_t value = 0;     // the first int32 of the reply (0 if none)
    size_t size = 0;       // bytes in the reply
};

// Sends `code` with the given int32 fields (and optionally a binder, and a
// C string, after them).
Reply call(uint32_t code, std::initializer_list<int32_t> ints = {},
           const android::sp<android::IBinder>& binder = nullptr, const char* text = nullptr);
Reply call(uint32_t code, const android::Parcel& request);

// A client's callback object in its own process: answers every event with
// int32 0 and records it.
android::sp<hostbinder::RemoteBinder> remoteCallback();
// A client's buffer producer in its own process.
android::sp<hostbinder::RemoteBinder> remoteProducer();

// One transaction as "code <c> flags <f>: <int32> <int32> ...", so the byte
// count (no interface token in front) and the values are checked in one go.
std::string describe(uint32_t code, const uint8_t* bytes, size_t size, uint32_t flags);
// What a client's binder received, one transaction a line.
std::vector<std::string> received(const hostbinder::RemoteBinder& client);

// Each text appears in `all`, after the one before it.
::testing::AssertionResult inOrder(const std::vector<std::string>& all, std::initializer_list<std::string> texts);

}  // namespace enginetest

#endif  // QUELLBORN_TESTS_ENGINEHARNESS_H
