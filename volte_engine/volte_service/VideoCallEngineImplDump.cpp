// The engine's state copied for diagnostics without waiting on the devices,
// the libraries or the client that its operations may be waiting on.
#include <binder/IInterface.h>
#include <pthread.h>
#include <unistd.h>

#include <chrono>

#include "VideoCallEngineImpl.h"

namespace android {

namespace {

constexpr auto kRetryPause = std::chrono::milliseconds(1);

// Tries `tryLock` until it succeeds or `patienceMs` have passed.
template <typename TryLock>
bool lockWithin(int patienceMs, TryLock tryLock) {
    const auto deadline = std::chrono::steady_clock::now() + std::chrono::milliseconds(patienceMs);
    while (!tryLock()) {
        if (std::chrono::steady_clock::now() >= deadline) return false;
        usleep(std::chrono::duration_cast<std::chrono::microseconds>(kRetryPause).count());
    }
    return true;
}

}  // namespace

VideoCallEngineImpl::Snapshot VideoCallEngineImpl::snapshot(int patienceMs) {
    Snapshot s;
    if (lockWithin(patienceMs, [this] { return mOpLock.try_lock(); })) {
        std::lock_guard<std::recursive_mutex> op(mOpLock, std::adopt_lock);
        s.stateRead = true;
        s.cameraId = mCameraId;
        s.openCameraId = mOpenCameraId;
        s.captureHandle = mCaptureHandle;
        s.cameraSize = mCameraSize;
        s.deviceOrientation = mDeviceOrientation;
        s.screenOrientation = mScreenOrientation;
        s.autoRotate = mAutoRotate;
        s.cameraAngle = cameraAngle();
        s.displayAngle = displayAngle();
        s.remoteRotation = mRemoteRotation;
        s.remoteSurface = mRemoteSurface != nullptr;
        s.previewSurface = mPreviewSurface != nullptr;
        s.localRenderStarted = mLocalRenderStarted;
        s.remoteRenderStarted = mRemoteRenderStarted;
        s.localRenderId = mLocalRenderStarted ? captureName(mOpenCameraId) : nullptr;
        s.remoteRenderId = mRemoteRenderId;
        s.hiddenImage = mHiddenImage;
        s.uplinkQos = mUplinkQos;
        s.loopback = mLoopback;
        s.loopbackStream = mLoopbackStream;
    }
    if (lockWithin(patienceMs, [this] { return pthread_mutex_trylock(&mLock) == 0; })) {
        s.callbackRead = true;
        s.callbackSet = mNotifyCallback != nullptr;
        // A proxy knows from the driver whether its process lives: asking
        // makes no call. Asked here, so the dump never holds the proxy and
        // never becomes the one that drops it last.
        s.callbackAlive = s.callbackSet && IInterface::asBinder(mNotifyCallback)->isBinderAlive();
        pthread_mutex_unlock(&mLock);
    }
    return s;
}

}  // namespace android
