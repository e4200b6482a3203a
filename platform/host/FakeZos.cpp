// Recording stand-in for the media engine's runtime, with a clock the tests set.
#include <atomic>

#include "CallRecorder.h"
#include "Zos.h"

namespace hostfakes {
namespace {

std::atomic<unsigned int> gNow{0};
std::atomic<PFN_ZOSPRINT> gPrint{nullptr};

const bool kResetHook = [] {
    CallRecorder::instance().addResetHook([] {
        gNow = 0;
        gPrint = nullptr;
    });
    return true;
}();

}  // namespace

void setZosTime(unsigned int now) { gNow = now; }

bool zosPrint(const char* text) {
    const PFN_ZOSPRINT print = gPrint.load();
    if (print == nullptr) return false;
    print(text);
    return true;
}

}  // namespace hostfakes

using namespace hostfakes;

extern "C" {

int Zos_CfgSetLogLevel(unsigned int iLevel) {
    return recordCall("Zos_CfgSetLogLevel", {argText(iLevel)});
}

int Zos_CfgSetLogDisp(PFN_ZOSPRINT pfnPrint) {
    gPrint = pfnPrint;
    return recordCall("Zos_CfgSetLogDisp", {pfnPrint != nullptr ? "print" : "NULL"});
}

int Zos_CfgSetLogDir(const char* pcDir) { return recordCall("Zos_CfgSetLogDir", {argText(pcDir)}); }

int Zos_CfgSetAppCtx(void* pAppCtx) {
    return recordCall("Zos_CfgSetAppCtx", {pAppCtx != nullptr ? "ctx" : "NULL"});
}

int Zos_SysInit(void) { return recordCall("Zos_SysInit", {}); }
int Zos_SysDestroy(void) { return recordCall("Zos_SysDestroy", {}); }

// Not recorded: the bridge reads the clock as part of other work, and the
// record should show that work, not every clock read.
unsigned int Zos_Time(unsigned int* puiTime) {
    const unsigned int now = gNow.load();
    if (puiTime != nullptr) *puiTime = now;
    return now;
}

int Zos_ModDriveMsg(void) { return recordCall("Zos_ModDriveMsg", {}); }

}  // extern "C"
