#include "IVideoCallEngineCallback.h"

#include <android/log.h>
#include <binder/Parcel.h>

namespace android {

namespace {
constexpr const char* kTag = "VideoCallEngineImpl";
}  // namespace

IMPLEMENT_META_INTERFACE(VideoCallEngineCallback, "android.videocallengine.callback")

BpVideoCallEngineCallback::BpVideoCallEngineCallback(const sp<IBinder>& impl)
        : BpInterface<IVideoCallEngineCallback>(impl) {}

BpVideoCallEngineCallback::~BpVideoCallEngineCallback() = default;

// The client's receiving side reads the integers directly, so no interface
// token is written. A failed transaction leaves the reply empty and reads as 0.
int BpVideoCallEngineCallback::notifyCallback(int event) {
    __android_log_print(ANDROID_LOG_INFO, kTag, "BpVideoCallEngineCallback %s, %d",
                        "notifyCallback", event);
    Parcel data;
    Parcel reply;
    data.writeInt32(event);
    remote()->transact(NOTIFY_CALLBACK, data, &reply, 0);
    return reply.readInt32();
}

int BpVideoCallEngineCallback::notifyCallback(int event, int arg1, int arg2, int arg3) {
    __android_log_print(ANDROID_LOG_INFO, kTag, "BpVideoCallEngineCallback %s with data, %d, %d, %d, %d",
                        "notifyCallback", event, arg1, arg2, arg3);
    Parcel data;
    Parcel reply;
    data.writeInt32(event);
    data.writeInt32(arg1);
    data.writeInt32(arg2);
    data.writeInt32(arg3);
    remote()->transact(NOTIFY_CALLBACK_WITH_DATA, data, &reply, 0);
    return reply.readInt32();
}

}  // namespace android
