// Recording stand-in for the render library. renderAdd takes the surface
// over (the library keeps its own reference until the render is removed);
// renderRemove can be made slow so a test sees that nobody waits for it.
#include <gui/Surface.h>
#include <utils/StrongPointer.h>

#include <chrono>
#include <condition_variable>
#include <map>
#include <thread>

#include "CallRecorder.h"
#include "render.h"

namespace hostfakes {
namespace {

struct RenderState {
    std::map<std::string, android::sp<android::Surface>> renders;
    int removeDelayMs = 0;
    size_t removesDone = 0;
};

// Removal threads are detached and may still signal while the process
// exits, so the condition variable is never destroyed (like the state).
std::condition_variable& removed() {
    static auto* cond = new std::condition_variable();
    return *cond;
}

RenderState& state() {
    static RenderState* s = [] {
        auto* fresh = new RenderState();
        CallRecorder::instance().addResetHook([fresh] {
            RenderState old;
            {
                std::lock_guard<std::mutex> lock(CallRecorder::instance().stateMutex());
                std::swap(*fresh, old);
            }
            // `old` releases the surfaces here, outside the lock.
        });
        return fresh;
    }();
    return *s;
}

}  // namespace

void setRenderRemoveDelayMs(int ms) {
    {
        std::lock_guard<std::mutex> lock(CallRecorder::instance().stateMutex());
        state().removeDelayMs = ms;
    }
    removed().notify_all();
}

std::vector<std::string> activeRenders() {
    std::lock_guard<std::mutex> lock(CallRecorder::instance().stateMutex());
    std::vector<std::string> ids;
    for (const auto& entry : state().renders) ids.push_back(entry.first);
    return ids;
}

bool waitForRenderRemoves(size_t count, int timeoutMs) {
    std::unique_lock<std::mutex> lock(CallRecorder::instance().stateMutex());
    return removed().wait_for(lock, std::chrono::milliseconds(timeoutMs),
                              [count] { return state().removesDone >= count; });
}

}  // namespace hostfakes

using namespace hostfakes;

extern "C" {

int renderInit(void) { return recordCall("renderInit", {}); }
int renderTerm(void) { return recordCall("renderTerm", {}); }

int renderAdd(android::Surface* pSurface, const char* pcRenderId) {
    // Taken over whatever the outcome: the caller keeps no reference.
    android::sp<android::Surface> surface(pSurface);
    CallRecorder& r = CallRecorder::instance();
    const int result = r.resultFor("renderAdd", pSurface != nullptr && pcRenderId != nullptr ? 0 : -1);
    if (result == 0) {
        std::lock_guard<std::mutex> lock(r.stateMutex());
        state().renders[pcRenderId] = surface;
    }
    return r.record("renderAdd", {pSurface != nullptr ? "surface" : "NULL", argText(pcRenderId)},
                    result);
}

int renderRotate(const char* pcRenderId, int iAngle) {
    return recordCall("renderRotate", {argText(pcRenderId), argText(iAngle)});
}

int renderRemove(const char* pcRenderId) {
    CallRecorder& r = CallRecorder::instance();
    {
        // A slow library; setting the delay back to 0 lets a hung call return.
        std::unique_lock<std::mutex> lock(r.stateMutex());
        const auto until = std::chrono::steady_clock::now() + std::chrono::milliseconds(state().removeDelayMs);
        removed().wait_until(lock, until, [] { return state().removeDelayMs == 0; });
    }
    android::sp<android::Surface> released;
    {
        std::lock_guard<std::mutex> lock(r.stateMutex());
        if (pcRenderId != nullptr) {
            auto it = state().renders.find(pcRenderId);
            if (it != state().renders.end()) {
                released = it->second;
                state().renders.erase(it);
            }
        }
    }
    // A library's remove has let the surface go by the time it returns, and
    // the call is on record only from then on: a test that saw the call
    // complete must not find the surface still alive.
    released.clear();
    const int result = recordCall("renderRemove", {argText(pcRenderId)});
    {
        std::lock_guard<std::mutex> lock(r.stateMutex());
        ++state().removesDone;
    }
    removed().notify_all();
    return result;
}

}  // extern "C"
