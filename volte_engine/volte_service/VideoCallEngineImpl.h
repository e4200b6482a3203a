// The single video call engine behind the binder service: camera, renders,
// display orientation, uplink QoS, the still-image substitute, the video
// library's events, client notification and a local loopback mode.
//
// Sources by subject: VideoCallEngineImpl.cpp (lifecycle and notification),
// VideoCallEngineImplCamera.cpp, VideoCallEngineImplRender.cpp,
// VideoCallEngineImplListener.cpp (video library events) and
// VideoCallEngineImplLoopback.cpp.
//
// Locking: the client's operations arrive on several binder threads; one
// engine-wide lock (mOpLock, recursive because operations build on each
// other) serialises them. mLock guards the client callback and is held for
// each notification, the client's handler included, and for each callback
// change. The handler may call back into the engine, and the binder driver
// runs that call on the notifying thread, so mLock is recursive and is always
// taken before mOpLock, never while it is held; the service takes it before
// its own callback lock.
#ifndef QUELLBORN_VOLTE_VIDEOCALLENGINEIMPL_H
#define QUELLBORN_VOLTE_VIDEOCALLENGINEIMPL_H

#include <gui/IGraphicBufferProducer.h>
#include <pthread.h>
#include <utils/StrongPointer.h>

#include <cstdint>
#include <mutex>
#include <string>

#include "IVideoCallEngineCallback.h"
#include "MmeEventObserver.h"
#include "ZmfEventObserver.h"

namespace android {

class VtspManager;

class VideoCallEngineImpl : public ZmfEventObserver, public MmeEventObserver {
public:
    // Client events.
    enum {
        VCE_EVENT_REMOTE_VIDEO_SIZE = 11,
        VCE_EVENT_RTP_BREAK = 14,
        VCE_EVENT_RTP_RECEIVED = 15,
    };

    // The process's engine, created on first use.
    static VideoCallEngineImpl* getInstance();
    // The service's hold on the engine: each service object takes one with
    // acquireInstance() and gives it back with releaseInstance(); the engine
    // is deleted when the last is given back, and sInstance forgets it, so a
    // deleted engine is never reached again. A later getInstance() builds a
    // new one.
    static VideoCallEngineImpl* acquireInstance();
    static void releaseInstance(VideoCallEngineImpl* engine);

    VideoCallEngineImpl();
    ~VideoCallEngineImpl() override;
    VideoCallEngineImpl(const VideoCallEngineImpl&) = delete;
    VideoCallEngineImpl& operator=(const VideoCallEngineImpl&) = delete;

    // Lifecycle and notification.
    int loadZmf(int value, const char* packageName);
    int initMme();
    void init(int loopback);
    void setNotifyCallback(const sp<IVideoCallEngineCallback>& callback);
    void release();
    int notifyCallback(int event);
    int notifyCallback(int event, int arg1, int arg2, int arg3);
    void mmeEvtUpdate(int event) override;

    // Video library events.
    void zmfRenderEvtUpdate(int event, const char* renderId, int sourceType, int width,
                            int height) override;
    void zmfCaptureEvtUpdate(int event, const char* captureId, int width, int height,
                             int frameRate) override;

    // Camera.
    int setCameraId(int id);
    long startCapture(int id);
    int stopCapture(long handle);
    int restartCapture(long handle, int size);
    void setCameraPreviewSize(int size);
    void setDisplayOrientation(int device, int screen, int autoRotate);
    void setUplinkQos(int kbps);
    int getCameraSizeFromQos();

    // Renders.
    void setRemoteSurface(const sp<IGraphicBufferProducer>& producer);
    void setPreviewSurface(const sp<IGraphicBufferProducer>& producer);
    int addRender(const sp<IGraphicBufferProducer>& producer, const char* renderId);
    int removeRender(const char* renderId);
    static void* RenderRemoveThreadWrapper(void* renderId);
    void hideLocalImage(bool enable, const char* path);

    // Loopback.
    void startLoopBack();
    void stopLoopBack();

    // Capture name of a camera id: also the capture's render id.
    static const char* captureName(int cameraId);

    // A copy of the engine's state for diagnostics.
    struct Snapshot {
        bool stateRead = false;     // false: an operation held the engine too long
        bool callbackRead = false;  // false: a notification held the callback too long
        bool callbackSet = false;
        bool callbackAlive = false;
        int cameraId = -1;
        int openCameraId = -1;
        int64_t captureHandle = 0;
        int cameraSize = -1;
        int deviceOrientation = 0;
        int screenOrientation = 0;
        int autoRotate = 1;
        int cameraAngle = 0;
        int displayAngle = 0;
        int remoteRotation = 0;
        bool remoteSurface = false;
        bool previewSurface = false;
        bool localRenderStarted = false;
        bool remoteRenderStarted = false;
        const char* localRenderId = nullptr;
        const char* remoteRenderId = nullptr;
        std::string hiddenImage;
        int uplinkQos = 0;
        bool loopback = false;
        int loopbackStream = 0;
    };
    // Copies the state under the engine's locks, each tried for at most
    // `patienceMs`: an operation may hold them across the camera driver,
    // the renderer or the client, and diagnostics never wait on those.
    Snapshot snapshot(int patienceMs);

    sp<IGraphicBufferProducer> mRemoteSurface;
    sp<IGraphicBufferProducer> mPreviewSurface;
    int mCameraSize;
    int mCameraId;
    int mAutoRotate;
    int mDeviceOrientation;
    int mScreenOrientation;
    int mRemoteRotation;
    pthread_mutex_t mLock;
    sp<IVideoCallEngineCallback> mNotifyCallback;
    int64_t mCaptureHandle;
    int mOpenCameraId;
    bool mLocalRenderStarted;
    const char* mRemoteRenderId;
    bool mRemoteRenderStarted;
    int mUplinkQos;
    bool mLoopback;
    int mLoopbackStream;
    VtspManager* mVtspManager;
    // The image shown in place of the camera, kept for diagnostics (the
    // client's text lives only as long as its request); empty when none.
    std::string mHiddenImage;

private:
    // getInstance() for a caller that holds the instance lock.
    static VideoCallEngineImpl* instanceLocked();
    int cameraAngle() const;
    int displayAngle() const;
    int notifyLocked(int event, const int* args);
    // release()'s media part: renders, camera and loopback stream.
    void releaseMedia();
    // Starts a detached thread that removes a render (the engine does not wait).
    void startRenderRemoval(const char* renderId);
    bool addRenderFor(const char* caller, const sp<IGraphicBufferProducer>& producer,
                      const char* renderId);

    std::recursive_mutex mOpLock;

    static VideoCallEngineImpl* sInstance;
};

}  // namespace android

#endif  // QUELLBORN_VOLTE_VIDEOCALLENGINEIMPL_H
