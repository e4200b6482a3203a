// The binder service "VideoCallEngineService" through which the IMS
// application drives the engine. A request is a transaction code plus int32
// fields, binders and at most one C string; no interface token is used.
#ifndef QUELLBORN_VOLTE_VIDEOCALLENGINESERVICE_H
#define QUELLBORN_VOLTE_VIDEOCALLENGINESERVICE_H

#include <binder/Binder.h>
#include <binder/IBinder.h>
#include <binder/Parcel.h>
#include <utils/String16.h>
#include <utils/Vector.h>

#include <mutex>

#include "IVideoCallEngineCallback.h"

namespace android {

class VideoCallEngineImpl;

class VideoCallEngineService : public BBinder, public IBinder::DeathRecipient {
public:
    enum {
        VCE_ACTION_INIT = 0,
        VCE_ACTION_SET_SURFACE = 1,
        VCE_ACTION_SET_CALLBACK = 2,
        VCE_ACTION_CLEAN_CALLBACK = 3,
        VCE_ACTION_ENGINE_INIT = 4,
        VCE_ACTION_CLEAN_SURFACE = 7,
        VCE_ACTION_RELEASE = 8,
        VCE_ACTION_SET_CAMERAID = 9,
        VCE_ACTION_SET_CAMERASIZE = 10,
        VCE_ACTION_DISPLAY_ORIENTATION = 11,
        VCE_ACTION_HIDE_LOCAL_IMAGE = 16,
        VCE_ACTION_SET_UPLINK_QOS = 17,
    };
    // Surface targets of codes 1 and 7.
    enum { TARGET_REMOTE = 0, TARGET_LOCAL = 1 };

    static constexpr const char* kServiceName = "VideoCallEngineService";
    static constexpr const char* kPackageName = "com.tessaroval.vce";
    static constexpr int kZmfValue = 24;

    // Creates one service object and registers it with the service manager.
    static status_t instantiate();

    VideoCallEngineService();
    ~VideoCallEngineService() override;

    status_t onTransact(uint32_t code, const Parcel& data, Parcel* reply, uint32_t flags) override;
    void binderDied(const wp<IBinder>& who) override;
    // `dumpsys VideoCallEngineService [--engine] [--link] [--streams]
    // [--history] [-h]`: reached through BBinder's handling of the dump
    // transaction. Callers without android.permission.DUMP get one line.
    status_t dump(int fd, const Vector<String16>& args) override;
    void release();

    sp<IVideoCallEngineCallback> mCallback;
    VideoCallEngineImpl* mVideoCallEngineImpl;

private:
    void setSurface(const Parcel& data, Parcel* reply);
    void setCallback(const Parcel& data);
    void cleanCallback();
    void cleanSurface(const Parcel& data);
    void hideLocalImage(const Parcel& data);

    // Codes 2 and 3 replace mCallback and its death link from any binder
    // thread; this keeps each replacement and its engine call in one piece.
    // Taken after the engine's callback lock (mLock), which a notification
    // holds while the client's handler may send code 2 or 3 on that thread.
    std::mutex mCallbackLock;
};

}  // namespace android

#endif  // QUELLBORN_VOLTE_VIDEOCALLENGINESERVICE_H
