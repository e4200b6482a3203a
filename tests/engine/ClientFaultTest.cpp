// A client at fault: its process dies while the engine is inside its
// handler, or before it cleans its callback; its handler is slow, calls back
// into the engine or changes the callback; the render library never finishes
// taking a render away. A callback dead before it is set is CallbackTest's part.
#include <condition_variable>
#include <functional>
#include <future>
#include <mutex>

#include "EngineTestUtil.h"
#include "MmeJni.h"
#include "Mvd.h"
#include "WatchedThreads.h"

using namespace android;
using namespace enginecase;
using namespace std::chrono_literals;
using hostbinder::RemoteBinder;

namespace {

constexpr auto kWatchdog = 30s;
const char* const kSizeEvent = "zmfRenderEvtUpdate, evt:28 [Remote], type 0, [640x480]";
const char* const kDied = "binderDied, ims app died";

class ClientFaultTest : public EngineCase {
protected:
    void SetUp() override {
        EngineCase::SetUp();
        // The media engine's start-up installs its event procedure so.
        ASSERT_EQ(0, Mvd_EvntSetCallback(Mvd_EvntProc, 1));
    }
    void TearDown() override {
        openGate();
        mThreads.join();
        send(kCleanCallback);  // no later case reaches a gated handler
        EngineCase::TearDown();
    }

    // Runs `body` on a thread of its own: a media library's, or another binder thread.
    template <typename Body>
    auto onThread(Body body) { return mThreads.run(std::move(body)); }
    template <typename T>
    bool finishes(std::future<T>& f) const { return mThreads.finishes(f); }

    // A client whose handler stays inside the transaction until the gate
    // opens: a client busy in its handler, or whose process dies meanwhile.
    // `then` runs in the handler once the gate is open.
    sp<RemoteBinder> gatedClient(std::function<void()> then = {}) {
        return new RemoteBinder(
                [this, then](uint32_t, const Parcel&, Parcel* reply, uint32_t) {
                    {
                        std::unique_lock<std::mutex> hold(mGateLock);
                        mMostInside = std::max(mMostInside, ++mInside);
                        mGateCond.wait(hold, [&] { return mGateOpen; });
                        --mInside;
                    }
                    if (then) then();
                    reply->writeInt32(0);
                    return NO_ERROR;
                },
                String16("android.videocallengine.callback"));
    }
    void closeGate() {
        std::lock_guard<std::mutex> hold(mGateLock);
        mGateOpen = false;
    }
    bool handlerInside() {
        return eventually([&] {
            std::lock_guard<std::mutex> hold(mGateLock);
            return mInside == 1;
        });
    }
    void openGate() {
        std::lock_guard<std::mutex> hold(mGateLock);
        mGateOpen = true;
        mGateCond.notify_all();
    }

    void startMedia() {
        EXPECT_EQ(0, setCamera(1));
        setSurface(kRemoteView);
    }
    void expectMediaEnded() {
        EXPECT_TRUE(hostfakes::openCameras().empty());
        settleRemovals();
        EXPECT_TRUE(hostfakes::activeRenders().empty());
    }
    size_t deaths() const { return log.count(ANDROID_LOG_INFO, kServiceTag, kDied); }
    size_t count(const std::string& text) const { return log.count(ANDROID_LOG_INFO, kEngineTag, text); }

    std::mutex mGateLock;
    std::condition_variable mGateCond;
    bool mGateOpen = false;
    int mInside = 0, mMostInside = 0;

private:
    WatchedThreads mThreads{kWatchdog};
};

}  // namespace

TEST_F(ClientFaultTest, ADeadClientIsReleasedOnceAndItsCleanAndSuccessorAreHarmless) {
    // The client dies while the engine waits inside its handler.
    const sp<RemoteBinder> first = gatedClient();
    send(kSetCallback, {}, first);
    startMedia();
    auto notified = onThread([] { return hostfakes::fireMvdEvent(tagMVD_EVNT{{22}}); });
    ASSERT_TRUE(first->waitForTransactions(1, kWatchdog));
    auto died = onThread([&] { return first->kill(); });
    ASSERT_TRUE(log.waitFor(ANDROID_LOG_INFO, kServiceTag, kDied));
    auto sized = onThread([] { return hostfakes::fireZmfEvent(27, kRemoteSize); });
    ASSERT_TRUE(log.waitFor(ANDROID_LOG_INFO, kEngineTag, kSizeEvent));
    // The call's media ends at once; only dropping the callback waits for the notification.
    EXPECT_TRUE(eventually([] { return hostfakes::openCameras().empty(); }));
    EXPECT_EQ(0u, count("release X"));
    openGate();  // the dead process's transaction fails
    ASSERT_TRUE(finishes(notified) && finishes(died) && finishes(sized));
    EXPECT_EQ(0, notified.get());
    EXPECT_TRUE(died.get());
    EXPECT_TRUE(sized.get());
    EXPECT_EQ(1u, count("release X"));
    expectMediaEnded();
    // The size waiting behind it found the callback gone or failed on the dead client.
    EXPECT_EQ(1u, count("notifyCallback null") +
                          count("BpVideoCallEngineCallback notifyCallback with data, 11, 640, 480, 0"));
    EXPECT_EQ((Strings{"code 0 flags 0: 14"}), received(*first));

    // A process dies once: a second death reports and releases nothing.
    markCalls();
    const size_t lines = engineLines().size();
    EXPECT_FALSE(first->kill());
    EXPECT_EQ(1u, deaths());
    EXPECT_EQ(Strings{}, engineLinesSince(lines));
    // The clean it never sent, sent now: nothing to release, nothing called.
    EXPECT_EQ(0, send(kCleanCallback));
    EXPECT_EQ((Strings{"setNotifyCallback, callback (nil)"}), engineLinesSince(lines));
    EXPECT_TRUE(newCalls().empty());

    // The next client owes no release, hears the events, and its own death is watched.
    const sp<RemoteBinder> second = enginetest::remoteCallback();
    send(kSetCallback, {}, second);
    EXPECT_EQ(1u, second->deathRecipientCount());
    startMedia();
    mmeEvent(23);
    EXPECT_EQ((Strings{"code 0 flags 0: 15"}), received(*second));
    EXPECT_EQ(1u, first->transactionCount());
    ASSERT_TRUE(second->kill());
    EXPECT_FALSE(second->kill());
    EXPECT_EQ(2u, deaths());
    expectMediaEnded();
    // Dead without a clean, then replaced by a third client: still no release owed.
    send(kSetCallback, {}, enginetest::remoteCallback());
    EXPECT_EQ(0u, count("VCE is not released as expected"));
    EXPECT_EQ(2u, count("release X"));
}

// A slow handler holds up only the other notifications. Then a handler that
// calls back into the engine (the binder driver runs such a call on the
// notifying thread) while another client thread releases: the release waits
// for the notification, the handler's call does not wait for the release.
TEST_F(ClientFaultTest, ASlowHandlerHoldsUpOnlyNotificationsAndAReleaseNotItsOwnCallBack) {
    const sp<RemoteBinder> client = gatedClient();
    send(kSetCallback, {}, client);
    auto broken = onThread([] { return hostfakes::fireMvdEvent(tagMVD_EVNT{{22}}); });
    ASSERT_TRUE(handlerInside());
    // Two more events on two more threads reach the engine and wait for the first.
    auto received23 = onThread([] { return hostfakes::fireMvdEvent(tagMVD_EVNT{{23}}); });
    auto sized = onThread([] { return hostfakes::fireZmfEvent(27, kRemoteSize); });
    ASSERT_TRUE(log.waitFor(ANDROID_LOG_INFO, kEngineTag, "mmeEvtUpdate evt: 23"));
    ASSERT_TRUE(log.waitFor(ANDROID_LOG_INFO, kEngineTag, kSizeEvent));

    // Meanwhile the client's requests that leave the callback alone are all answered.
    auto requests = onThread([this] {
        EXPECT_EQ(0, setCamera(1));
        EXPECT_EQ(0, send(kCameraSize, {3}));
        EXPECT_EQ(0, send(kOrientation, {90, 1, 1}));
        EXPECT_EQ(0, send(kUplinkQos, {500}));
        setSurface(kRemoteView);
        setSurface(kLocalView);
        EXPECT_EQ(0, send(kHideImage, {1}, nullptr, "/data/vce/hold.png"));
        EXPECT_EQ(0, send(kCleanSurface, {kLocalView}));
        return setCamera(-1);
    });
    ASSERT_TRUE(finishes(requests)) << "a request waited for the client's handler";
    EXPECT_EQ(0, requests.get());
    EXPECT_EQ(1u, client->transactionCount());

    openGate();
    ASSERT_TRUE(finishes(broken) && finishes(received23) && finishes(sized));
    EXPECT_EQ(0, broken.get());
    EXPECT_EQ(0, received23.get());
    EXPECT_TRUE(sized.get());
    // All three delivered, one at a time, the first first.
    Strings delivered = received(*client);
    ASSERT_EQ(3u, delivered.size());
    std::sort(delivered.begin() + 1, delivered.end());
    EXPECT_EQ((Strings{"code 0 flags 0: 14", "code 0 flags 0: 15", "code 1 flags 0: 11 640 480 0"}), delivered);
    EXPECT_EQ(1, mMostInside);
    EXPECT_EQ(0u, count("notifyCallback null"));

    // Again with a call in progress, which another client thread releases.
    closeGate();
    startMedia();
    auto notified = onThread([] { return hostfakes::fireMvdEvent(tagMVD_EVNT{{22}}); });
    ASSERT_TRUE(handlerInside());
    auto released = onThread([this] { return send(kRelease); });
    // The camera closing is the release's last step before it waits for the notification.
    ASSERT_TRUE(eventually([] { return hostfakes::openCameras().empty(); }));
    auto nested = onThread([] { return enginetest::call(kOrientation, {90, 0, 1}).status; });
    ASSERT_TRUE(finishes(nested));
    EXPECT_EQ(NO_ERROR, nested.get());
    EXPECT_EQ(1u, count("setDisplayOrientation, device: 0 -> 90, screen: 0 -> 0, auto_rotate: 1 -> 1"));
    EXPECT_EQ(0u, count("release X"));
    openGate();
    ASSERT_TRUE(finishes(notified) && finishes(released));
    EXPECT_EQ(1u, count("release X"));
}

// The render library never finishes taking a render away: adding that render
// again waits a bounded time, and no other request waits for it at all.
TEST_F(ClientFaultTest, AHungRenderRemovalStallsNoOtherRequest) {
    setSurface(kRemoteView);
    hostfakes::setRenderRemoveDelayMs(24 * 3600 * 1000);
    cleanSurface(kRemoteView);
    auto again = onThread([this] { return send(kSetSurface, {kRemoteView}, enginetest::remoteProducer()); });
    ASSERT_TRUE(log.waitFor(ANDROID_LOG_INFO, kEngineTag, "setRemoteSurface add Render"));
    auto others = onThread([this] {
        EXPECT_EQ(0, setCamera(1));
        orient(90, 1, 1);
        return send(kUplinkQos, {500});
    });
    const bool answered = finishes(others) && finishes(again);
    hostfakes::setRenderRemoveDelayMs(0);  // the library's call returns at last
    ASSERT_TRUE(answered) << "a request waited for the hung removal";
    EXPECT_EQ(0, others.get());
    EXPECT_EQ(0, again.get());
    EXPECT_TRUE(logged("addRender, removal of Remote still pending, adding it anyway", ANDROID_LOG_ERROR));
}

// The handler answers the event with a request of its own, which the binder
// driver runs on the notifying thread, while another client thread (or the
// client's death) changes the callback too.
TEST_F(ClientFaultTest, AHandlerChangingTheCallbackWhileNotifiedIsAnswered) {
    constexpr uint32_t kNothing = 100, kDeath = 101;
    const struct {
        uint32_t nested, other;
    } cases[] = {
            {kSetCallback, kNothing}, {kCleanCallback, kNothing}, {kRelease, kNothing},
            {kSetCallback, kCleanCallback}, {kCleanCallback, kRelease}, {kRelease, kSetCallback},
            {kSetCallback, kDeath},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE("nested " + std::to_string(c.nested) + ", other " + std::to_string(c.other));
        closeGate();
        const sp<RemoteBinder> next = enginetest::remoteCallback();
        enginetest::Reply nested{-1, -1, 0};
        const sp<RemoteBinder> client = gatedClient([&] {
            nested = enginetest::call(c.nested, {}, c.nested == kSetCallback ? next : nullptr);
        });
        send(kSetCallback, {}, client);
        startMedia();
        auto notified = onThread([] { return hostfakes::fireMvdEvent(tagMVD_EVNT{{22}}); });
        ASSERT_TRUE(handlerInside());
        log.clear();
        std::future<bool> other;
        const sp<RemoteBinder> otherClient = enginetest::remoteCallback();
        if (c.other == kDeath) {
            other = onThread([&] { return client->kill(); });
            ASSERT_TRUE(log.waitFor(ANDROID_LOG_INFO, kServiceTag, kDied));
        } else if (c.other != kNothing) {
            other = onThread([&] { return send(c.other, {}, otherClient) == 0; });
            ASSERT_TRUE(eventually([&] { return !log.linesWithTag(kServiceTag).empty(); }));
        }
        // The other thread's change waits for the notification in progress.
        EXPECT_FALSE(other.valid() && other.wait_for(0s) == std::future_status::ready);
        openGate();
        ASSERT_TRUE(finishes(notified)) << "the nested request never came back";
        EXPECT_EQ(0, notified.get());
        EXPECT_EQ(NO_ERROR, nested.status);
        EXPECT_EQ(0, nested.value);
        if (other.valid()) {
            ASSERT_TRUE(finishes(other));
            EXPECT_TRUE(other.get());
            EXPECT_EQ(Strings{}, received(*otherClient));  // the notification was not repeated to it
            continue;
        }
        // Alone, the handler's request has its whole effect.
        EXPECT_EQ(c.nested == kSetCallback ? 1u : 0u, count("VCE is not released as expected"));
        EXPECT_EQ(c.nested == kCleanCallback, !hostfakes::openCameras().empty());
        mmeEvent(23);
        EXPECT_EQ(c.nested == kSetCallback ? Strings{"code 0 flags 0: 15"} : Strings{}, received(*next));
        EXPECT_EQ(c.nested == kSetCallback ? 0u : 1u, count("notifyCallback null"));
        EXPECT_EQ(1u, client->transactionCount());
    }
}
