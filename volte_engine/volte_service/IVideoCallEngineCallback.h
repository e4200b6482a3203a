// The interface through which the engine reports events to its client, the
// IMS application, over binder ("android.videocallengine.callback").
//
// Wire format of the two transactions the client receives (no interface
// token in front):
//   code 0: int32 event                                 -> reply int32
//   code 1: int32 event, int32 v1, int32 v2, int32 v3   -> reply int32
#ifndef QUELLBORN_VOLTE_IVIDEOCALLENGINECALLBACK_H
#define QUELLBORN_VOLTE_IVIDEOCALLENGINECALLBACK_H

#include <binder/IInterface.h>

namespace android {

class IVideoCallEngineCallback : public IInterface {
public:
    DECLARE_META_INTERFACE(VideoCallEngineCallback)

    enum { NOTIFY_CALLBACK = 0, NOTIFY_CALLBACK_WITH_DATA = 1 };

    virtual int notifyCallback(int event) = 0;
    virtual int notifyCallback(int event, int arg1, int arg2, int arg3) = 0;
};

// The proxy for a callback object in the client's process.
class BpVideoCallEngineCallback : public BpInterface<IVideoCallEngineCallback> {
public:
    explicit BpVideoCallEngineCallback(const sp<IBinder>& impl);
    ~BpVideoCallEngineCallback() override;

    int notifyCallback(int event) override;
    int notifyCallback(int event, int arg1, int arg2, int arg3) override;
};

}  // namespace android

#endif  // QUELLBORN_VOLTE_IVIDEOCALLENGINECALLBACK_H
