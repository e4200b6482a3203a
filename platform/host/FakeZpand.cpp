// Stand-in for the runtime's platform adaptation: keeps the functions the
// system installs and lets tests call them from the engine's own threads.
#include <atomic>

#include "CallRecorder.h"
#include "Zpand.h"

namespace hostfakes {
namespace {

std::atomic<PFN_ZPANDMODPOSTDRV> gPostDrv{nullptr};
std::atomic<PFN_ZPANDTIMERINIT> gTimerInit{nullptr};
std::atomic<PFN_ZPANDTIMERDESTROY> gTimerDestroy{nullptr};
std::atomic<PFN_ZPANDTIMERSTART> gTimerStart{nullptr};
std::atomic<PFN_ZPANDTIMERSTOP> gTimerStop{nullptr};

const bool kResetHook = [] {
    CallRecorder::instance().addResetHook([] {
        gPostDrv = nullptr;
        gTimerInit = nullptr;
        gTimerDestroy = nullptr;
        gTimerStart = nullptr;
        gTimerStop = nullptr;
    });
    return true;
}();

// The runtime's own expiry handler for its one timer.
void zosTimerActive(bool flag) { recordCall("Zos_TimerActive", {argText(flag ? 1 : 0)}); }

template <typename Fn>
int fire(const std::atomic<Fn>& installed) {
    const Fn fn = installed.load();
    if (fn == nullptr) return kNotInstalled;
    return runOnEngineThread([fn] { return fn(); });
}

const char* installed(bool set) { return set ? "installed" : "NULL"; }

}  // namespace

int fireZpandModPostDrv() { return fire(gPostDrv); }
int fireZpandTimerInit() { return fire(gTimerInit); }
int fireZpandTimerDestroy() { return fire(gTimerDestroy); }
int fireZpandTimerStop() { return fire(gTimerStop); }

int fireZpandTimerStart(unsigned int length) {
    const PFN_ZPANDTIMERSTART fn = gTimerStart.load();
    if (fn == nullptr) return kNotInstalled;
    return runOnEngineThread([fn, length] { return fn(length, zosTimerActive); });
}

}  // namespace hostfakes

using namespace hostfakes;

extern "C" {

int Zpand_ModSetPostDrv(PFN_ZPANDMODPOSTDRV pfn) {
    gPostDrv = pfn;
    return recordCall("Zpand_ModSetPostDrv", {installed(pfn != nullptr)});
}

int Zpand_TimerSetInit(PFN_ZPANDTIMERINIT pfn) {
    gTimerInit = pfn;
    return recordCall("Zpand_TimerSetInit", {installed(pfn != nullptr)});
}

int Zpand_TimerSetDestroy(PFN_ZPANDTIMERDESTROY pfn) {
    gTimerDestroy = pfn;
    return recordCall("Zpand_TimerSetDestroy", {installed(pfn != nullptr)});
}

int Zpand_TimerSetStart(PFN_ZPANDTIMERSTART pfn) {
    gTimerStart = pfn;
    return recordCall("Zpand_TimerSetStart", {installed(pfn != nullptr)});
}

int Zpand_TimerSetStop(PFN_ZPANDTIMERSTOP pfn) {
    gTimerStop = pfn;
    return recordCall("Zpand_TimerSetStop", {installed(pfn != nullptr)});
}

}  // extern "C"
