// The engine's camera: open and close, capture size from the preview size or
// the uplink QoS, and the device and screen orientation.
#include <android/log.h>

#include "VideoCallEngineImpl.h"
#include "VtspManager.h"
#include "camdrv.h"
#include "render.h"

namespace android {

namespace {

constexpr const char* kTag = "VideoCallEngineImpl";

#define LOGI(...) __android_log_print(ANDROID_LOG_INFO, kTag, __VA_ARGS__)

constexpr int kNoCamera = -1;
constexpr int kFrontCameraId = 1;
constexpr int kFrontFacing = 1;
constexpr int kBackFacing = -1;
constexpr int kFrontOrientation = 270;
constexpr int kBackOrientation = 90;

// Uplink rates (bit/s) from which the capture size steps up.
constexpr int kQosVga30Fps = 896000;
constexpr int kQosVga15Fps = 480000;

// The landscape VGA/QVGA configurations (7 to 10) are captured in their
// portrait forms (1 to 4).
constexpr int kFirstLandscapeSize = CameraCodecParameter::CAMERA_VGA_15FPS;
constexpr int kLandscapeToPortrait = 6;

// The capture's 32-bit handle as the driver knows it.
int driverHandle(long handle) { return static_cast<int>(handle); }

}  // namespace

const char* VideoCallEngineImpl::captureName(int cameraId) {
    return cameraId == kFrontCameraId ? kFrontCameraName : kBackCameraName;
}

// The client may send any int32 orientation: worked out in 64 bits the
// formulas cannot overflow, and every remainder fits an int again.
int VideoCallEngineImpl::cameraAngle() const {
    return static_cast<int>((360LL - mDeviceOrientation) % 360);
}

int VideoCallEngineImpl::displayAngle() const {
    return static_cast<int>((720LL - mDeviceOrientation - 90LL * mScreenOrientation) % 360);
}

int VideoCallEngineImpl::getCameraSizeFromQos() {
    std::lock_guard<std::recursive_mutex> op(mOpLock);
    if (mUplinkQos == 0) {
        LOGI("getCameraSizeFromQos, no QOS seted");
        return CameraCodecParameter::CAMERA_VGA_REVERSED_30FPS;
    }
    const int size = mUplinkQos >= kQosVga30Fps   ? CameraCodecParameter::CAMERA_VGA_REVERSED_30FPS
                   : mUplinkQos >= kQosVga15Fps   ? CameraCodecParameter::CAMERA_VGA_REVERSED_15FPS
                                                  : CameraCodecParameter::CAMERA_QVGA_REVERSED_15FPS;
    LOGI("getCameraSizeFromQos, QOS:%d, camerasize:%d", mUplinkQos, size);
    return size;
}

long VideoCallEngineImpl::startCapture(int id) {
    std::lock_guard<std::recursive_mutex> op(mOpLock);
    LOGI("%s, id: %d", "startCapture", id);
    if (mCameraSize < 0) mCameraSize = getCameraSizeFromQos();
    LOGI("%s, id: %d, camera size: %d", "startCapture", id, mCameraSize);
    const auto config = static_cast<CameraCodecParameter::CameraConfigEnum>(mCameraSize);
    mVtspManager->mCmdCallback->setCodecParam(config);
    VtspManager::CameraResolution resolution{};
    mVtspManager->getCameraResolution(config, resolution);
    const bool front = id == kFrontCameraId;
    const int handle = camdrvOpen(captureName(id), id, front ? kFrontFacing : kBackFacing,
                                  front ? kFrontOrientation : kBackOrientation, resolution.width,
                                  resolution.height, resolution.frameRate);
    if (handle != 0) {
        mCameraId = id;
        mOpenCameraId = id;
        camdrvOrientAngle(cameraAngle());
    }
    return handle;
}

int VideoCallEngineImpl::stopCapture(long handle) {
    std::lock_guard<std::recursive_mutex> op(mOpLock);
    LOGI("%s", "stopCapture");
    if (handle != 0) {
        camdrvStop(driverHandle(handle));
        mCaptureHandle = 0;
    }
    mCameraId = kNoCamera;
    mOpenCameraId = kNoCamera;
    return 0;
}

int VideoCallEngineImpl::setCameraId(int id) {
    std::lock_guard<std::recursive_mutex> op(mOpLock);
    if (id == kNoCamera) {
        if (mCaptureHandle == 0) {
            LOGI("%s %d, camera is closed", "setCameraId", kNoCamera);
            return 0;
        }
        LOGI("%s %d, close camera", "setCameraId", kNoCamera);
        mVtspManager->mCmdCallback->setCaptureId(nullptr);
        removeRender(captureName(mOpenCameraId));
        mLocalRenderStarted = false;
        stopCapture(static_cast<int32_t>(mCaptureHandle));
        return 0;
    }

    // Switching cameras: the capture that is open would otherwise keep
    // running with nobody holding its handle, and its preview render would
    // stay under the old camera's name.
    if (mCaptureHandle != 0) setCameraId(kNoCamera);

    LOGI("%s %d, open camera", "setCameraId", id);
    mCaptureHandle = static_cast<int32_t>(startCapture(id));
    if (mCaptureHandle == 0) {
        LOGI("%s, startCapture failed", "setCameraId");
        return -1;
    }
    if (mOpenCameraId != kNoCamera) {
        if (mLoopback && mLoopbackStream != 0) {
            Mvd_CaptureAttach(mLoopbackStream, captureName(mOpenCameraId));
        }
        mVtspManager->mCmdCallback->setCaptureId(captureName(mOpenCameraId));
        // A preview surface given while the camera was closed is shown now,
        // without the client having to hand it over again.
        if (mPreviewSurface != nullptr && !mLocalRenderStarted) {
            LOGI("%s, id: %d, start local render", "setCameraId", id);
            if (addRenderFor("setCameraId", mPreviewSurface, captureName(mOpenCameraId))) {
                mLocalRenderStarted = true;
                renderRotate(captureName(mOpenCameraId), displayAngle());
            }
        }
    }
    return 0;
}

void VideoCallEngineImpl::setCameraPreviewSize(int size) {
    std::lock_guard<std::recursive_mutex> op(mOpLock);
    LOGI("%s", "setCameraPreviewSize");
    if (size >= kFirstLandscapeSize) {
        LOGI("%s always using reversed resolution for vga/qvga", "setCameraPreviewSize");
        size -= kLandscapeToPortrait;
    }
    if (size == mCameraSize) return;
    LOGI("%s, update %d -> %d", "setCameraPreviewSize", mCameraSize, size);
    if (mCaptureHandle != 0) {
        restartCapture(static_cast<int32_t>(mCaptureHandle), size);
    } else {
        LOGI("%s, camera is not open", "setCameraPreviewSize");
    }
    mCameraSize = size;
    if (mLoopback) {
        stopLoopBack();
        startLoopBack();
    }
}

int VideoCallEngineImpl::restartCapture(long handle, int size) {
    std::lock_guard<std::recursive_mutex> op(mOpLock);
    LOGI("%s, new_size:%d", "restartCapture", size);
    if (size == mCameraSize) {
        LOGI("%s, should never be here", "restartCapture");
        return 0;
    }
    mCameraSize = size;
    if (handle == 0) {
        if (mCameraId != kNoCamera) {
            LOGI("%s, try start capture", "restartCapture");
            mCaptureHandle = static_cast<int32_t>(startCapture(mCameraId));
        }
        // With no camera to start, the new size is only stored: it is used
        // at the next open, and handle 0 is never resized.
        return 0;
    }
    const auto config = static_cast<CameraCodecParameter::CameraConfigEnum>(size);
    mVtspManager->mCmdCallback->setCodecParam(config);
    VtspManager::CameraResolution resolution{};
    mVtspManager->getCameraResolution(config, resolution);
    camdrvResize(driverHandle(handle), resolution.width, resolution.height, resolution.frameRate);
    return 0;
}

void VideoCallEngineImpl::setUplinkQos(int kbps) {
    std::lock_guard<std::recursive_mutex> op(mOpLock);
    // Kept in bit/s; the product wraps like the 32-bit arithmetic it models.
    const int bps = static_cast<int>(static_cast<unsigned int>(kbps) * 1000u);
    if (bps == mUplinkQos) {
        LOGI("setUplinkQos, ignore %d", kbps);
        return;
    }
    LOGI("setUplinkQos, %d kbitps", kbps);
    mUplinkQos = bps;
}

void VideoCallEngineImpl::setDisplayOrientation(int device, int screen, int autoRotate) {
    std::lock_guard<std::recursive_mutex> op(mOpLock);
    LOGI("%s, device: %d -> %d, screen: %d -> %d, auto_rotate: %d -> %d", "setDisplayOrientation",
         mDeviceOrientation, device, mScreenOrientation, screen, mAutoRotate, autoRotate);
    mDeviceOrientation = device;
    mScreenOrientation = screen;
    if (mScreenOrientation != 0 && autoRotate == 0) {
        LOGI("%s, enforce screen orientation to be 0", "setDisplayOrientation");
        mScreenOrientation = 0;
    }
    if (mOpenCameraId != kNoCamera) camdrvOrientAngle(cameraAngle());
    if (mLocalRenderStarted) renderRotate(captureName(mOpenCameraId), displayAngle());
    // While auto-rotate stays on and the remote picture is upright, it is
    // left upright.
    const bool keepRemoteUpright = autoRotate != 0 && autoRotate == mAutoRotate && mRemoteRotation == 0;
    if (!keepRemoteUpright) {
        mRemoteRotation = displayAngle();
        if (mRemoteRenderStarted) renderRotate(mRemoteRenderId, mRemoteRotation);
    }
    mAutoRotate = autoRotate;
}

}  // namespace android
