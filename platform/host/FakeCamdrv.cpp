// Recording stand-in for the camera driver: hands out capture handles and
// remembers which captures are open.
#include <set>

#include "CallRecorder.h"
#include "camdrv.h"

namespace hostfakes {
namespace {

constexpr int kFirstHandle = 0x100;

struct CamState {
    int nextHandle = kFirstHandle;
    std::set<int> open;
};

CamState& state() {
    static CamState* s = [] {
        auto* fresh = new CamState();
        CallRecorder::instance().addResetHook([fresh] {
            std::lock_guard<std::mutex> lock(CallRecorder::instance().stateMutex());
            *fresh = CamState();
        });
        return fresh;
    }();
    return *s;
}

}  // namespace

void setNextCameraHandle(int handle) {
    std::lock_guard<std::mutex> lock(CallRecorder::instance().stateMutex());
    state().nextHandle = handle;
}

std::vector<int> openCameras() {
    std::lock_guard<std::mutex> lock(CallRecorder::instance().stateMutex());
    return std::vector<int>(state().open.begin(), state().open.end());
}

}  // namespace hostfakes

using namespace hostfakes;

extern "C" {

int camdrvInit(const char* pcPackageName, int iValue, const char* pcLibPath) {
    return recordCall("camdrvInit", {argText(pcPackageName), argText(iValue), argText(pcLibPath)});
}

int camdrvTerm(void) { return recordCall("camdrvTerm", {}); }

int camdrvOpen(const char* pcCaptureName, int iCameraId, int iFacing, int iOrientation,
               int iWidth, int iHeight, int iFrameRate) {
    CallRecorder& r = CallRecorder::instance();
    int handle;
    {
        std::lock_guard<std::mutex> lock(r.stateMutex());
        handle = state().nextHandle;
    }
    handle = r.resultFor("camdrvOpen", handle);
    if (handle != 0) {
        std::lock_guard<std::mutex> lock(r.stateMutex());
        state().open.insert(handle);
        state().nextHandle = handle + 1;
    }
    return r.record("camdrvOpen",
                    {argText(pcCaptureName), argText(iCameraId), argText(iFacing),
                     argText(iOrientation), argText(iWidth), argText(iHeight), argText(iFrameRate)},
                    handle);
}

int camdrvStop(int iHandle) {
    {
        std::lock_guard<std::mutex> lock(CallRecorder::instance().stateMutex());
        state().open.erase(iHandle);
    }
    return recordCall("camdrvStop", {argText(iHandle)});
}

int camdrvResize(int iHandle, int iWidth, int iHeight, int iFrameRate) {
    return recordCall("camdrvResize",
                      {argText(iHandle), argText(iWidth), argText(iHeight), argText(iFrameRate)});
}

int camdrvOrientAngle(int iAngle) { return recordCall("camdrvOrientAngle", {argText(iAngle)}); }

}  // extern "C"
