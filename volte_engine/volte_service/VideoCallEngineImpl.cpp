// The engine's lifecycle, its process-wide instance and client notification.
#include "VideoCallEngineImpl.h"

#include <android/log.h>

#include "ScopedPthreadLock.h"
#include "VtspManager.h"
#include "camdrv.h"
#include "render.h"

namespace android {

namespace {

constexpr const char* kTag = "VideoCallEngineImpl";
constexpr const char* kCamdrvLibPath = "system/lib64";

// Media engine stream events the client hears about.
constexpr int EN_MVD_EVNT_STRM_RTP_BREAK = 22;
constexpr int EN_MVD_EVNT_STRM_RTP_RECVED = 23;

#define LOGI(...) __android_log_print(ANDROID_LOG_INFO, kTag, __VA_ARGS__)

std::mutex gInstanceLock;
int gInstanceUsers = 0;

}  // namespace

VideoCallEngineImpl* VideoCallEngineImpl::sInstance = nullptr;

VideoCallEngineImpl* VideoCallEngineImpl::instanceLocked() {
    if (sInstance == nullptr) {
        LOGI("Create new Instance");
        sInstance = new VideoCallEngineImpl();
    }
    return sInstance;
}

VideoCallEngineImpl* VideoCallEngineImpl::getInstance() {
    std::lock_guard<std::mutex> lock(gInstanceLock);
    return instanceLocked();
}

VideoCallEngineImpl* VideoCallEngineImpl::acquireInstance() {
    // Looked up and counted in one step: a release in between would delete
    // the engine about to be handed out.
    std::lock_guard<std::mutex> lock(gInstanceLock);
    VideoCallEngineImpl* engine = instanceLocked();
    ++gInstanceUsers;
    return engine;
}

void VideoCallEngineImpl::releaseInstance(VideoCallEngineImpl* engine) {
    {
        std::lock_guard<std::mutex> lock(gInstanceLock);
        if (engine == nullptr || engine != sInstance) return;
        if (--gInstanceUsers > 0) return;
        gInstanceUsers = 0;
        sInstance = nullptr;
    }
    delete engine;
}

VideoCallEngineImpl::VideoCallEngineImpl()
        : mCameraSize(-1),
          mCameraId(-1),
          mAutoRotate(1),
          mDeviceOrientation(0),
          mScreenOrientation(0),
          mRemoteRotation(0),
          mCaptureHandle(0),
          mOpenCameraId(-1),
          mLocalRenderStarted(false),
          mRemoteRenderId(kRemoteRenderName),
          mRemoteRenderStarted(false),
          mUplinkQos(0),
          mLoopback(false),
          mLoopbackStream(0),
          mVtspManager(nullptr) {
    // Recursive: a client's handler that calls back during a notification
    // (run by the binder driver on the notifying thread) changes the callback
    // on the thread that holds mLock.
    pthread_mutexattr_t recursive;
    pthread_mutexattr_init(&recursive);
    pthread_mutexattr_settype(&recursive, PTHREAD_MUTEX_RECURSIVE);
    pthread_mutex_init(&mLock, &recursive);
    pthread_mutexattr_destroy(&recursive);
    mVtspManager = VtspManager::getInstance();
    LOGI("Construct");
    mVtspManager->init();
}

VideoCallEngineImpl::~VideoCallEngineImpl() {
    LOGI("Destruct");
    // The event paths keep raw pointers to their observer: a deleted engine
    // must not be called back, nor be freed under an event already inside it.
    unregisterZmfEventObserver(this);
    unregisterMmeEventObserver(this);
    camdrvTerm();
    renderTerm();
    zmfTerminate();
    {
        ScopedPthreadLock lock(mLock);
        mNotifyCallback.clear();
    }
    pthread_mutex_destroy(&mLock);
    mPreviewSurface.clear();
    mRemoteSurface.clear();
}

int VideoCallEngineImpl::loadZmf(int value, const char* packageName) {
    LOGI("loadZmf");
    zmfInitialize();
    registerZmfEventObserver(this);
    registerMmeEventObserver(this);
    camdrvInit(packageName, value, kCamdrvLibPath);
    renderInit();
    return 0;
}

int VideoCallEngineImpl::initMme() {
    return 0;
}

void VideoCallEngineImpl::init(int loopback) {
    std::lock_guard<std::recursive_mutex> op(mOpLock);
    LOGI("init, loopback? %d E", loopback);
    // A loopback init over an open loopback stream would leave the old one
    // running with nothing left to close it; a normal init leaves it to release.
    if (loopback != 0 && mLoopbackStream != 0) stopLoopBack();
    mLoopback = loopback != 0;
    mCameraId = -1;
    mUplinkQos = 0;
    mDeviceOrientation = 0;
    mScreenOrientation = 0;
    mRemoteRotation = 0;
    mRemoteSurface.clear();
    mPreviewSurface.clear();
    mHiddenImage.clear();
    mCameraSize = -1;
    if (mLoopback) startLoopBack();
    LOGI("init, loopback? %d X", mLoopback ? 1 : 0);
}

void VideoCallEngineImpl::setNotifyCallback(const sp<IVideoCallEngineCallback>& callback) {
    LOGI("%s, callback %p", "setNotifyCallback", callback.get());
    // Held throughout, so a change waits for the notification in progress and
    // the missing release and the new callback are one step for other threads.
    ScopedPthreadLock lock(mLock);
    if (callback != nullptr && mNotifyCallback != nullptr) {
        LOGI("VCE is not released as expected");
        release();
    }
    mNotifyCallback = callback;
}

void VideoCallEngineImpl::release() {
    releaseMedia();
    // Only dropping the callback waits for a notification in progress: the
    // call's media ends at once even when the client's handler is stuck.
    {
        ScopedPthreadLock lock(mLock);
        mNotifyCallback.clear();
    }
    LOGI("release X");
}

void VideoCallEngineImpl::releaseMedia() {
    std::lock_guard<std::recursive_mutex> op(mOpLock);
    LOGI("release");
    mAutoRotate = 1;
    mDeviceOrientation = 0;
    mScreenOrientation = 0;
    mRemoteRotation = 0;
    setRemoteSurface(nullptr);
    setPreviewSurface(nullptr);
    setCameraId(-1);
    // Also a stream left open by a normal init after a loopback one.
    if (mLoopback || mLoopbackStream != 0) stopLoopBack();
}

int VideoCallEngineImpl::notifyLocked(int event, const int* args) {
    ScopedPthreadLock lock(mLock);
    if (mNotifyCallback == nullptr) {
        LOGI("notifyCallback null");
        return -1;
    }
    // The client's handler runs while mLock is held, so a change from another
    // thread waits for the notification. A change the handler makes itself
    // may drop mNotifyCallback meanwhile; this reference keeps the object
    // being called alive until the call returns.
    const sp<IVideoCallEngineCallback> callback = mNotifyCallback;
    if (args == nullptr) {
        callback->notifyCallback(event);
    } else {
        callback->notifyCallback(event, args[0], args[1], args[2]);
    }
    return 0;
}

int VideoCallEngineImpl::notifyCallback(int event) {
    return notifyLocked(event, nullptr);
}

int VideoCallEngineImpl::notifyCallback(int event, int arg1, int arg2, int arg3) {
    const int args[3] = {arg1, arg2, arg3};
    return notifyLocked(event, args);
}

void VideoCallEngineImpl::mmeEvtUpdate(int event) {
    LOGI("%s evt: %d", "mmeEvtUpdate", event);
    if (event == EN_MVD_EVNT_STRM_RTP_BREAK) {
        notifyCallback(VCE_EVENT_RTP_BREAK);
    } else if (event == EN_MVD_EVNT_STRM_RTP_RECVED) {
        notifyCallback(VCE_EVENT_RTP_RECEIVED);
    }
}

}  // namespace android
