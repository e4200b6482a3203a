// The engine's renders: the remote view and the local preview, removal on
// detached threads, and the still image that replaces the camera picture.
#include <android/log.h>
#include <gui/Surface.h>

#include <chrono>
#include <condition_variable>
#include <map>
#include <mutex>
#include <string>

#include "VideoCallEngineImpl.h"
#include "VtspManager.h"
#include "render.h"

namespace android {

namespace {

constexpr const char* kTag = "VideoCallEngineImpl";

#define LOGI(...) __android_log_print(ANDROID_LOG_INFO, kTag, __VA_ARGS__)
#define LOGE(...) __android_log_print(ANDROID_LOG_ERROR, kTag, __VA_ARGS__)

// Removals run on detached threads so that the client's binder call never
// waits for the render library. A render added again under the same id must
// not be taken away by a removal still pending from before, so an add waits
// for the removals of its id that were started earlier, but only so long:
// the add holds the engine's operation lock, and a render library that hangs
// in one removal must not stall every client. The tracker lives for the
// process: removal threads may outlive the engine.
constexpr std::chrono::milliseconds kPendingRemovalWait(1000);

class PendingRemovals {
public:
    void started(const std::string& id) {
        std::lock_guard<std::mutex> lock(mMutex);
        ++mPending[id];
    }
    void finished(const std::string& id) {
        {
            std::lock_guard<std::mutex> lock(mMutex);
            if (--mPending[id] == 0) mPending.erase(id);
        }
        mDone.notify_all();
    }
    // False if a removal of `id` is still running after `timeout`.
    bool waitFor(const std::string& id, std::chrono::milliseconds timeout) {
        std::unique_lock<std::mutex> lock(mMutex);
        return mDone.wait_for(lock, timeout, [&] { return mPending.find(id) == mPending.end(); });
    }

private:
    std::mutex mMutex;
    std::condition_variable mDone;
    std::map<std::string, int> mPending;
};

PendingRemovals& pendingRemovals() {
    static PendingRemovals* removals = new PendingRemovals();
    return *removals;
}

}  // namespace

void* VideoCallEngineImpl::RenderRemoveThreadWrapper(void* renderId) {
    // The thread owns its copy of the id, so the caller's text may go away.
    std::unique_ptr<std::string> id(static_cast<std::string*>(renderId));
    renderRemove(id->c_str());
    pendingRemovals().finished(*id);
    return nullptr;
}

void VideoCallEngineImpl::startRenderRemoval(const char* renderId) {
    auto* id = new std::string(renderId);
    pendingRemovals().started(*id);
    pthread_attr_t attr;
    pthread_attr_init(&attr);
    pthread_attr_setdetachstate(&attr, PTHREAD_CREATE_DETACHED);
    pthread_t thread;
    if (pthread_create(&thread, &attr, RenderRemoveThreadWrapper, id) != 0) {
        // No thread: remove here rather than leave the render behind.
        RenderRemoveThreadWrapper(id);
    }
    pthread_attr_destroy(&attr);
}

int VideoCallEngineImpl::removeRender(const char* renderId) {
    LOGI("%s", "removeRender");
    startRenderRemoval(renderId);
    return 0;
}

int VideoCallEngineImpl::addRender(const sp<IGraphicBufferProducer>& producer,
                                   const char* renderId) {
    if (!pendingRemovals().waitFor(renderId, kPendingRemovalWait)) {
        LOGE("addRender, removal of %s still pending, adding it anyway", renderId);
    }
    // The render library takes the surface over; the engine keeps no reference.
    return renderAdd(new Surface(producer, false), renderId);
}

bool VideoCallEngineImpl::addRenderFor(const char* caller, const sp<IGraphicBufferProducer>& producer,
                                       const char* renderId) {
    if (addRender(producer, renderId) != 0) {
        LOGE("%s, addRender failed", caller);
        return false;
    }
    return true;
}

void VideoCallEngineImpl::setRemoteSurface(const sp<IGraphicBufferProducer>& producer) {
    std::lock_guard<std::recursive_mutex> op(mOpLock);
    LOGI("%s", "setRemoteSurface");
    mRemoteSurface = producer;
    if (producer != nullptr) {
        if (mRemoteRenderStarted) {
            LOGI("%s, remote render is started", "setRemoteSurface");
            return;
        }
        LOGI("%s add Render", "setRemoteSurface");
        if (addRenderFor("setRemoteSurface", producer, mRemoteRenderId)) {
            mRemoteRenderStarted = true;
            renderRotate(mRemoteRenderId, mRemoteRotation);
            mVtspManager->mCmdCallback->setRenderId(mRemoteRenderId);
        }
    } else {
        LOGI("%s null", "setRemoteSurface");
        if (mRemoteRenderStarted) {
            mVtspManager->mCmdCallback->setRenderId(nullptr);
            removeRender(mRemoteRenderId);
            mRemoteRenderStarted = false;
        }
    }
    LOGI("%s X", "setRemoteSurface");
}

void VideoCallEngineImpl::setPreviewSurface(const sp<IGraphicBufferProducer>& producer) {
    std::lock_guard<std::recursive_mutex> op(mOpLock);
    LOGI("%s", "setPreviewSurface");
    mPreviewSurface = producer;
    if (producer != nullptr) {
        if (mLocalRenderStarted) {
            LOGI("%s, local render is started", "setPreviewSurface");
            return;
        }
        if (mOpenCameraId == -1) {
            LOGI("%s add Render, camera is not opened", "setPreviewSurface");
            return;
        }
        LOGI("%s add Render", "setPreviewSurface");
        if (addRenderFor("setPreviewSurface", producer, captureName(mOpenCameraId))) {
            mLocalRenderStarted = true;
            renderRotate(captureName(mOpenCameraId), displayAngle());
        }
    } else {
        LOGI("%s null", "setPreviewSurface");
        if (mLocalRenderStarted) {
            removeRender(captureName(mOpenCameraId));
            mLocalRenderStarted = false;
        }
    }
    LOGI("%s X", "setPreviewSurface");
}

void VideoCallEngineImpl::hideLocalImage(bool enable, const char* path) {
    std::lock_guard<std::recursive_mutex> op(mOpLock);
    LOGI("hideLocalImage, enable = %d, path = %s", enable ? 1 : 0, path != nullptr ? path : "(null)");
    mHiddenImage = enable && path != nullptr ? path : "";
    mVtspManager->mCmdCallback->sendReplacedImage(enable, path);
    if (!mLoopback || mLoopbackStream == 0) return;
    if (enable) {
        Mvd_FileStartSendImage(mLoopbackStream, path);
    } else {
        Mvd_FileStopSendImage(mLoopbackStream);
    }
}

}  // namespace android
