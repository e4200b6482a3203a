#include "ImsClient.h"

#include <binder/IServiceManager.h>
#include <binder/Parcel.h>
#include <utils/String16.h>

#include "VideoCallEngineService.h"

using android::IBinder;
using android::Parcel;
using android::sp;
using android::status_t;
using android::VideoCallEngineService;
using hostbinder::RemoteBinder;

namespace {

struct Action {
    const char* verb;
    uint32_t code;
    const char* label;
};

// Client verbs that are one plain transaction of their integers.
const Action kPlainActions[] = {
        {"clean-callback", VideoCallEngineService::VCE_ACTION_CLEAN_CALLBACK, "CLEAN_CALLBACK"},
        {"init", VideoCallEngineService::VCE_ACTION_ENGINE_INIT, "ENGINE_INIT"},
        {"clean-surface", VideoCallEngineService::VCE_ACTION_CLEAN_SURFACE, "CLEAN_SURFACE"},
        {"camera", VideoCallEngineService::VCE_ACTION_SET_CAMERAID, "SET_CAMERAID"},
        {"size", VideoCallEngineService::VCE_ACTION_SET_CAMERASIZE, "SET_CAMERASIZE"},
        {"orientation", VideoCallEngineService::VCE_ACTION_DISPLAY_ORIENTATION, "DISPLAY_ORIENTATION"},
        {"qos", VideoCallEngineService::VCE_ACTION_SET_UPLINK_QOS, "SET_UPLINK_QOS"},
        {"release", VideoCallEngineService::VCE_ACTION_RELEASE, "RELEASE"},
};

std::string joined(const std::vector<int32_t>& ints) {
    std::string out;
    for (int32_t v : ints) out += " " + std::to_string(v);
    return out;
}

}  // namespace

ImsClient::ImsClient(Timeline* timeline) : mTimeline(timeline) {
    mService = android::defaultServiceManager()->checkService(android::String16(VideoCallEngineService::kServiceName));
}

const char* ImsClient::eventName(int32_t event) {
    switch (event) {
        case 11: return "remote video size";
        case 14: return "RTP break";
        case 15: return "RTP received";
        default: return "unknown event";
    }
}

void ImsClient::show(const std::string& text, const std::string& mscFrom, const std::string& mscTo,
                     const std::string& target) {
    TimelineEntry entry;
    entry.kind = mscFrom == "client" ? TimelineEntry::Kind::kStep : TimelineEntry::Kind::kEvent;
    entry.actor = "client";
    entry.target = target;
    entry.text = text;
    entry.mscFrom = mscFrom;
    entry.mscTo = mscTo;
    mTimeline->add(entry);
}

void ImsClient::transact(uint32_t code, const std::string& label, const std::vector<int32_t>& ints,
                         const sp<IBinder>& binder, const char* text) {
    show(label, "client", "vce", "service");
    Parcel request, reply;
    for (int32_t v : ints) request.writeInt32(v);
    if (binder != nullptr) request.writeStrongBinder(binder);
    if (text != nullptr) request.writeCString(text);
    // Without a binder, SET_CALLBACK clears the callback as CLEAN_CALLBACK
    // does; RELEASE drops it too. With one, setCallback keeps the account.
    const bool dropsCallback = binder == nullptr && (code == VideoCallEngineService::VCE_ACTION_SET_CALLBACK ||
                                                     code == VideoCallEngineService::VCE_ACTION_CLEAN_CALLBACK ||
                                                     code == VideoCallEngineService::VCE_ACTION_RELEASE);
    const CallbackTracker::Change change = dropsCallback ? mCallbacks.changeIssued() : CallbackTracker::Change{};
    const status_t status = mService->transact(code, request, &reply);
    if (dropsCallback) mCallbacks.changeReturned(change);
    reply.setDataPosition(0);
    const int32_t answer = reply.readInt32();
    mLastReply.store(answer);
    const std::string result = reply.dataSize() >= sizeof(int32_t) ? "<- reply " + std::to_string(answer)
                                                                   : "<- no reply";
    show(status == android::NO_ERROR ? result : result + ", status " + std::to_string(status), "vce", "client");
}

void ImsClient::perform(const ScenarioStep& step) {
    for (const Action& action : kPlainActions) {
        if (step.verb == action.verb) {
            const std::string label = step.text.empty() ? joined(step.ints) : " " + step.text;
            transact(action.code, action.label + label, step.ints);
            return;
        }
    }
    if (step.verb == "callback") {
        setCallback();
    } else if (step.verb == "callback-reentrant") {
        setCallback(step.ints[0]);
    } else if (step.verb == "surface") {
        setSurface(step);
    } else if (step.verb == "hide") {
        transact(VideoCallEngineService::VCE_ACTION_HIDE_LOCAL_IMAGE, "HIDE_LOCAL_IMAGE 1 \"" + step.text + "\"", {1},
                 nullptr, step.text.c_str());
    } else if (step.verb == "show") {
        transact(VideoCallEngineService::VCE_ACTION_HIDE_LOCAL_IMAGE, "HIDE_LOCAL_IMAGE 0", {0});
    } else if (step.verb == "die") {
        die();
    } else if (step.verb == "send") {
        const std::vector<int32_t> fields(step.ints.begin() + 1, step.ints.end());
        transact(static_cast<uint32_t>(step.ints[0]), "code " + std::to_string(step.ints[0]) + joined(fields), fields);
    }
}

void ImsClient::setCallback(int32_t reentrantCode) {
    const int number = mCallbacks.registering();
    mCallbackNumber = number;
    mCallback = new RemoteBinder(
            [this, number, reentrantCode](uint32_t code, const Parcel& data, Parcel* reply, uint32_t) {
                return receive(code, data, reply, number, reentrantCode);
            },
            android::String16("android.videocallengine.callback"));
    const CallbackTracker::Change replaced = mCallbacks.changeIssued();
    transact(VideoCallEngineService::VCE_ACTION_SET_CALLBACK,
             reentrantCode < 0 ? "SET_CALLBACK" : "SET_CALLBACK (answers events with code " +
                                                          std::to_string(reentrantCode) + ")",
             {}, mCallback);
    mCallbacks.registered(number);
    mCallbacks.changeReturned(replaced);
}

void ImsClient::setSurface(const ScenarioStep& step) {
    sp<RemoteBinder>& producer = mSurfaces[step.ints[0] == 0 ? 0 : 1];
    producer = new RemoteBinder({}, android::String16("android.gui.IGraphicBufferProducer"));
    transact(VideoCallEngineService::VCE_ACTION_SET_SURFACE, "SET_SURFACE " + step.text, step.ints, producer);
}

void ImsClient::die() {
    show("x  process dies (callback binder killed)", "client", "vce");
    if (mCallback == nullptr) return;
    // Killed first: an event already inside the handler was sent in time.
    mCallback->kill();
    mCallbacks.died(mCallbackNumber);
}

status_t ImsClient::receive(uint32_t code, const Parcel& data, Parcel* reply, int callback,
                           int32_t reentrantCode) {
    if (mCallbacks.retired(callback)) mStaleEvents.fetch_add(1);
    Event event;
    event.event = data.readInt32();
    if (code == 1) {
        for (int i = 0; i < 3; ++i) event.values.push_back(data.readInt32());
    }
    {
        std::lock_guard<std::mutex> lock(mLock);
        mEvents.push_back(event);
    }
    show("<- event " + std::to_string(event.event) + " (" + eventName(event.event) + ")" + joined(event.values), "vce",
         "client");
    // A client that answers an event by calling the service again, from the
    // handler: the binder driver runs that call on the notifying thread.
    if (reentrantCode >= 0) {
        transact(static_cast<uint32_t>(reentrantCode), "code " + std::to_string(reentrantCode) + " from the handler",
                 {});
    }
    reply->writeInt32(0);
    return android::NO_ERROR;
}

std::vector<ImsClient::Event> ImsClient::eventsSince(size_t from) const {
    std::lock_guard<std::mutex> lock(mLock);
    if (from >= mEvents.size()) return {};
    return std::vector<Event>(mEvents.begin() + static_cast<std::ptrdiff_t>(from), mEvents.end());
}

size_t ImsClient::eventCount() const {
    std::lock_guard<std::mutex> lock(mLock);
    return mEvents.size();
}
