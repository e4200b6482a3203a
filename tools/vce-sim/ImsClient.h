// The IMS application as the engine sees it: a process of its own that
// reaches the registered "VideoCallEngineService" with binder transactions,
// hands over its callback and its surfaces (binders of its process), and
// can die. Every event its callback receives is kept and shown.
#ifndef QUELLBORN_TOOLS_VCESIM_IMSCLIENT_H
#define QUELLBORN_TOOLS_VCESIM_IMSCLIENT_H

#include <binder/IBinder.h>
#include <utils/StrongPointer.h>

#include <atomic>
#include <cstdint>
#include <mutex>
#include <string>
#include <vector>

#include "CallbackTracker.h"
#include "RemoteBinder.h"
#include "Scenario.h"
#include "Timeline.h"

class ImsClient {
public:
    struct Event {
        int32_t event = 0;
        std::vector<int32_t> values;  // empty for the one-integer form
    };

    // Looks the service up as a client does; valid() is false if it is not registered.
    explicit ImsClient(Timeline* timeline);
    bool valid() const { return mService != nullptr; }

    // Performs a client step of a scenario.
    void perform(const ScenarioStep& step);

    // The reply integer of the last transaction (0 when none came back).
    int32_t lastReply() const { return mLastReply.load(); }
    std::vector<Event> eventsSince(size_t from) const;
    size_t eventCount() const;
    // Events that reached a callback the client had already replaced,
    // cleaned or lost with its process: the engine should never send those.
    size_t staleEvents() const { return mStaleEvents.load(); }
    // True while the client believes a callback of its own is registered.
    bool hasCallback() const { return mCallbacks.anyRegistered(); }

    static const char* eventName(int32_t event);

private:
    void transact(uint32_t code, const std::string& label, const std::vector<int32_t>& ints,
                  const android::sp<android::IBinder>& binder = nullptr, const char* text = nullptr);
    void setCallback(int32_t reentrantCode = -1);
    void setSurface(const ScenarioStep& step);
    void die();
    android::status_t receive(uint32_t code, const android::Parcel& data, android::Parcel* reply, int callback,
                              int32_t reentrantCode);
    void show(const std::string& text, const std::string& mscFrom, const std::string& mscTo,
              const std::string& target = "");

    Timeline* const mTimeline;
    android::sp<android::IBinder> mService;
    android::sp<hostbinder::RemoteBinder> mCallback;
    android::sp<hostbinder::RemoteBinder> mSurfaces[2];
    std::atomic<int32_t> mLastReply{0};  // a handler may transact from the notifying thread
    mutable std::mutex mLock;
    std::vector<Event> mEvents;
    int mCallbackNumber = 0;                // the one mCallback is
    CallbackTracker mCallbacks;
    std::atomic<size_t> mStaleEvents{0};
};

#endif  // QUELLBORN_TOOLS_VCESIM_IMSCLIENT_H
