#include "VideoCallEngineService.h"

#include <android/log.h>
#include <binder/IServiceManager.h>
#include <binder/PermissionCache.h>
#include <gui/IGraphicBufferProducer.h>
#include <unistd.h>
#include <utils/String16.h>

#include <cerrno>
#include <cstdio>
#include <string>

#include "ScopedPthreadLock.h"
#include "VideoCallEngineDump.h"
#include "VideoCallEngineImpl.h"

namespace android {

namespace {

constexpr const char* kTag = "VideoCallEngineService";

#define LOGI(...) __android_log_print(ANDROID_LOG_INFO, kTag, __VA_ARGS__)
#define LOGE(...) __android_log_print(ANDROID_LOG_ERROR, kTag, __VA_ARGS__)

// Codes the service answers with 0 and nothing else.
constexpr uint32_t kSilentCodes[] = {14, 15, 18};
constexpr int kHide = 1;

constexpr const char* kDumpPermission = "android.permission.DUMP";

// Writes all of `text`; the reader (dumpsys) may take it in pieces.
status_t writeAll(int fd, const std::string& text) {
    size_t done = 0;
    while (done < text.size()) {
        const ssize_t n = write(fd, text.data() + done, text.size() - done);
        if (n > 0) {
            done += static_cast<size_t>(n);
        } else if (n == 0) {
            return -EIO;
        } else if (errno != EINTR) {
            return -errno;
        }
    }
    return NO_ERROR;
}

bool isSilent(uint32_t code) {
    for (uint32_t silent : kSilentCodes) {
        if (code == silent) return true;
    }
    return false;
}

}  // namespace

status_t VideoCallEngineService::instantiate() {
    LOGI("Instantiate");
    sp<IServiceManager> sm = defaultServiceManager();
    status_t ret;
    {
        sp<VideoCallEngineService> service = new VideoCallEngineService();
        ret = sm->addService(String16(kServiceName), service, false);
    }
    LOGI("Instantiate, ret = %d", ret);
    return ret;
}

VideoCallEngineService::VideoCallEngineService() : mCallback(nullptr), mVideoCallEngineImpl(nullptr) {
    LOGI("create");
    mVideoCallEngineImpl = VideoCallEngineImpl::acquireInstance();
    if (mVideoCallEngineImpl != nullptr) mVideoCallEngineImpl->loadZmf(kZmfValue, kPackageName);
}

VideoCallEngineService::~VideoCallEngineService() {
    LOGI("destory");
    if (mVideoCallEngineImpl != nullptr) {
        // The engine is shared by every service object: it goes when the last
        // of them lets it go, and is never reached again after that.
        VideoCallEngineImpl::releaseInstance(mVideoCallEngineImpl);
        mVideoCallEngineImpl = nullptr;
    }
    mCallback.clear();
}

void VideoCallEngineService::release() {
    LOGI("release");
    if (mVideoCallEngineImpl != nullptr) mVideoCallEngineImpl->release();
}

void VideoCallEngineService::binderDied(const wp<IBinder>& /*who*/) {
    LOGI("binderDied, ims app died");
    if (mVideoCallEngineImpl != nullptr) mVideoCallEngineImpl->release();
}

status_t VideoCallEngineService::dump(int fd, const Vector<String16>& args) {
    if (fd < 0) return BAD_VALUE;
    int32_t pid = 0;
    int32_t uid = 0;
    if (!PermissionCache::checkCallingPermission(String16(kDumpPermission), &pid, &uid)) {
        char denial[128];
        snprintf(denial, sizeof(denial), "Permission Denial: can't dump %s from pid=%d, uid=%d\n", kServiceName,
                 pid, uid);
        return writeAll(fd, denial);
    }
    // The text is built with every lock released again: a slow reader holds
    // up only this binder thread.
    return writeAll(fd, VideoCallEngineDump(args).text(mVideoCallEngineImpl));
}

status_t VideoCallEngineService::onTransact(uint32_t code, const Parcel& data, Parcel* reply,
                                            uint32_t flags) {
    if (code == VCE_ACTION_INIT) {
        LOGI("VCE_ACTION_INIT");
        if (mVideoCallEngineImpl == nullptr) {
            mVideoCallEngineImpl = VideoCallEngineImpl::acquireInstance();
        }
        reply->writeInt32(0);
        return NO_ERROR;
    }
    if (mVideoCallEngineImpl == nullptr) {
        LOGE("onTransact, code %d, mVideoCallEngineImpl is null", static_cast<int>(code));
        reply->writeInt32(0);
        return NO_ERROR;
    }
    VideoCallEngineImpl* engine = mVideoCallEngineImpl;
    int32_t result = 0;
    switch (code) {
        case VCE_ACTION_SET_SURFACE:
            setSurface(data, reply);
            return NO_ERROR;
        case VCE_ACTION_SET_CALLBACK:
            setCallback(data);
            break;
        case VCE_ACTION_CLEAN_CALLBACK:
            cleanCallback();
            break;
        case VCE_ACTION_ENGINE_INIT:
            engine->init(data.readInt32());
            break;
        case VCE_ACTION_CLEAN_SURFACE:
            cleanSurface(data);
            break;
        case VCE_ACTION_RELEASE:
            LOGI("VCE_ACTION_RELEASE");
            engine->release();
            break;
        case VCE_ACTION_SET_CAMERAID:
            LOGI("VCE_ACTION_SET_CAMERAID");
            result = engine->setCameraId(data.readInt32());
            break;
        case VCE_ACTION_SET_CAMERASIZE:
            LOGI("VCE_ACTION_SET_CAMERASIZE");
            engine->setCameraPreviewSize(data.readInt32());
            break;
        case VCE_ACTION_DISPLAY_ORIENTATION: {
            LOGI("VCE_ACTION_DISPLAY_ORIENTATION");
            const int32_t device = data.readInt32();
            const int32_t screen = data.readInt32();
            const int32_t autoRotate = data.readInt32();
            engine->setDisplayOrientation(device, screen, autoRotate);
            break;
        }
        case VCE_ACTION_HIDE_LOCAL_IMAGE:
            hideLocalImage(data);
            break;
        case VCE_ACTION_SET_UPLINK_QOS:
            LOGI("VCE_ACTION_SET_UPLINK_QOS");
            engine->setUplinkQos(data.readInt32());
            break;
        default:
            if (!isSilent(code)) return BBinder::onTransact(code, data, reply, flags);
            break;
    }
    reply->writeInt32(result);
    return NO_ERROR;
}

void VideoCallEngineService::setSurface(const Parcel& data, Parcel* reply) {
    const int32_t target = data.readInt32();
    sp<IGraphicBufferProducer> producer = IGraphicBufferProducer::asInterface(data.readStrongBinder());
    if (producer == nullptr) {
        // Clearing a surface is VCE_ACTION_CLEAN_SURFACE's job; a missing
        // producer here is a client mistake and changes nothing.
        LOGE("VCE_ACTION_SET_SURFACE, target %d, producer is null, refused", target);
        reply->writeInt32(BAD_VALUE);
        return;
    }
    if (target == TARGET_LOCAL) {
        LOGI("VCE_ACTION_SET_SURFACE, Local");
        mVideoCallEngineImpl->setPreviewSurface(producer);
    } else if (target == TARGET_REMOTE) {
        LOGI("VCE_ACTION_SET_SURFACE, Remote");
        mVideoCallEngineImpl->setRemoteSurface(producer);
    }
    reply->writeInt32(0);
}

void VideoCallEngineService::setCallback(const Parcel& data) {
    LOGI("VCE_ACTION_SET_CALLBACK");
    ScopedPthreadLock notifications(mVideoCallEngineImpl->mLock);
    std::lock_guard<std::mutex> lock(mCallbackLock);
    // The previous client's death link stays: its death still releases the engine.
    mCallback = IVideoCallEngineCallback::asInterface(data.readStrongBinder());
    if (mCallback != nullptr) {
        IInterface::asBinder(mCallback)->linkToDeath(this, nullptr, 0);
    }
    mVideoCallEngineImpl->setNotifyCallback(mCallback);
}

void VideoCallEngineService::cleanCallback() {
    LOGI("VCE_ACTION_CLEAN_CALLBACK");
    ScopedPthreadLock notifications(mVideoCallEngineImpl->mLock);
    std::lock_guard<std::mutex> lock(mCallbackLock);
    if (mCallback != nullptr) {
        IInterface::asBinder(mCallback)->unlinkToDeath(this, nullptr, 0, nullptr);
    }
    mCallback.clear();
    mVideoCallEngineImpl->setNotifyCallback(mCallback);
}

void VideoCallEngineService::cleanSurface(const Parcel& data) {
    const int32_t target = data.readInt32();
    if (target == TARGET_LOCAL) {
        LOGI("VCE_ACTION_CLEAN_SURFACE, Local");
        mVideoCallEngineImpl->setPreviewSurface(nullptr);
    } else if (target == TARGET_REMOTE) {
        LOGI("VCE_ACTION_CLEAN_SURFACE, Remote");
        mVideoCallEngineImpl->setRemoteSurface(nullptr);
    }
}

void VideoCallEngineService::hideLocalImage(const Parcel& data) {
    LOGI("VCE_ACTION_HIDE_LOCAL_IMAGE");
    const bool hide = data.readInt32() == kHide;
    const char* path = hide ? data.readCString() : nullptr;
    if (hide && path == nullptr) {
        // A truncated request: there is no image to send in the camera's
        // place, and the media engine must never get a null path. It is
        // answered as every request handled here is.
        LOGE("VCE_ACTION_HIDE_LOCAL_IMAGE, image path missing, refused");
        return;
    }
    mVideoCallEngineImpl->hideLocalImage(hide, path);
}

}  // namespace android
