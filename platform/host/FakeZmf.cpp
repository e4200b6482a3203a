// Recording stand-in for the video library: start-up, the one listener, event
// names, and a JSON scanner that reads the system's templates.
#include <atomic>
#include <cctype>
#include <cerrno>
#include <climits>
#include <cstdarg>
#include <cstdlib>
#include <string>

#include "CallRecorder.h"
#include "Zmf.h"

namespace hostfakes {
namespace {

std::atomic<ZmfVideoListener> gListener{nullptr};
std::atomic<bool> gInitialized{false};

const bool kResetHook = [] {
    CallRecorder::instance().addResetHook([] {
        gListener = nullptr;
        gInitialized = false;
    });
    return true;
}();

bool scanInteger(const char*& json, long long low, long long high, long long* value) {
    while (isspace(static_cast<unsigned char>(*json))) ++json;
    char* end = nullptr;
    errno = 0;
    const long long v = strtoll(json, &end, 10);
    if (end == json || errno == ERANGE || v < low || v > high) return false;
    json = end;
    *value = v;
    return true;
}

// The library's own scanner reads JSON by a printf-like template: literal
// text must match exactly, %s copies up to the next '"' however long that
// is (the library does not know the caller's buffer), %d an int and %ld a long.
// Scanning stops at the first mismatch; the count of values filled so far is
// the result.
int scan(const char* json, const char* format, va_list ap) {
    int filled = 0;
    const char* j = json;
    const char* f = format;
    while (*f != '\0') {
        if (f[0] != '%') {
            if (*j != *f) break;
            ++j;
            ++f;
            continue;
        }
        if (f[1] == 's') {
            char* out = va_arg(ap, char*);
            size_t n = 0;
            while (*j != '\0' && *j != '"') out[n++] = *j++;
            out[n] = '\0';
            ++filled;
            f += 2;
        } else if (f[1] == 'd') {
            int* out = va_arg(ap, int*);
            long long v = 0;
            if (!scanInteger(j, INT_MIN, INT_MAX, &v)) break;
            *out = static_cast<int>(v);
            ++filled;
            f += 2;
        } else if (f[1] == 'l' && f[2] == 'd') {
            long* out = va_arg(ap, long*);
            long long v = 0;
            if (!scanInteger(j, LONG_MIN, LONG_MAX, &v)) break;
            *out = static_cast<long>(v);
            ++filled;
            f += 3;
        } else {
            break;
        }
    }
    return filled;
}

}  // namespace

bool fireZmfEvent(int event, const char* json, int arg) {
    const ZmfVideoListener listener = gListener.load();
    if (listener == nullptr) return false;
    listener(event, json, arg);
    return true;
}

bool zmfListenerRegistered() { return gListener.load() != nullptr; }
bool zmfInitialized() { return gInitialized.load(); }

}  // namespace hostfakes

using namespace hostfakes;

extern "C" {

int Zmf_OnIntialize(void) {
    const int result = recordCall("Zmf_OnIntialize", {});
    if (result == 0) gInitialized = true;
    return result;
}

int Zmf_OnTerminate(void) {
    const int result = recordCall("Zmf_OnTerminate", {});
    if (result == 0) gInitialized = false;
    return result;
}

int Zmf_VideoSetListener(ZmfVideoListener pfnListener) {
    const int result = recordCall("Zmf_VideoSetListener", {pfnListener != nullptr ? "listener" : "NULL"});
    if (result == 0) gListener = pfnListener;
    return result;
}

const char* Zmf_GetEventName(int iEvent) {
    // Names are made once for the events the library has; others share one.
    static const std::string* names = [] {
        auto* table = new std::string[64];
        for (int i = 0; i < 64; ++i) table[i] = "ZmfEvent" + std::to_string(i);
        return table;
    }();
    return iEvent >= 0 && iEvent < 64 ? names[iEvent].c_str() : "ZmfEventUnknown";
}

int Zmf_ScanfJson(const char* pcJson, const char* pcFormat, ...) {
    int filled = 0;
    if (pcJson != nullptr && pcFormat != nullptr) {
        va_list ap;
        va_start(ap, pcFormat);
        filled = scan(pcJson, pcFormat, ap);
        va_end(ap);
    }
    return recordCall("Zmf_ScanfJson", {argText(pcJson), argText(pcFormat)}, filled);
}

}  // extern "C"
