// The client's callback seen from the client: what reaches it on the wire,
// a callback living in the service's own process, the death of the client's
// process, and how notifications and callback changes order themselves.
#include <android/log.h>
#include <binder/IInterface.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <chrono>
#include <cstring>
#include <future>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include "EngineHarness.h"
#include "HostFakes.h"
#include "IVideoCallEngineCallback.h"
#include "LogCapture.h"
#include "MmeEventObserver.h"

using namespace android;
using namespace std::chrono_literals;
using enginetest::call;
using hostbinder::RemoteBinder;
using ::testing::Contains;
using ::testing::Not;
using V = std::vector<std::string>;

namespace {

constexpr const char* kServiceTag = "VideoCallEngineService";
constexpr const char* kEngineTag = "VideoCallEngineImpl";
constexpr uint32_t SET_SURFACE = 1, SET_CALLBACK = 2, CLEAN_CALLBACK = 3, SET_CAMERAID = 9;
// Media engine stream events: first packet, RTP break, RTP received.
constexpr int kRtpFirstPacket = 21, kRtpBreak = 22, kRtpReceived = 23;
const char* const kSizeSent = "BpVideoCallEngineCallback notifyCallback with data, 11, 640, 480, 0";
const char* const kRemoteSize =
        "{\"Render\":\"Remote\",\"SourceType\":0,\"Window\":1,\"Width\":640,\"Height\":480}";

// One transaction as "code <c> flags <f>: <int32> <int32> ...", so the byte
// count (no interface token in front) and the values are checked in one go.
std::string describe(uint32_t code, const uint8_t* bytes, size_t size, uint32_t flags) {
    std::string out = "code " + std::to_string(code) + " flags " + std::to_string(flags) + ":";
    for (size_t at = 0; at + sizeof(int32_t) <= size; at += sizeof(int32_t)) {
        int32_t v;
        std::memcpy(&v, bytes + at, sizeof(v));
        out += " " + std::to_string(v);
    }
    if (size % sizeof(int32_t) != 0) out += " +" + std::to_string(size % sizeof(int32_t)) + " bytes";
    return out;
}

V received(const RemoteBinder& client) {
    V out;
    for (const RemoteBinder::Transaction& t : client.transactions()) {
        out.push_back(describe(t.code, t.data.data(), t.data.size(), t.flags));
    }
    return out;
}

// Keeps a shared order of events seen by different threads.
class Sequence {
public:
    void add(const std::string& what) {
        std::lock_guard<std::mutex> lock(mLock);
        mSeen.push_back(what);
    }
    V seen() const {
        std::lock_guard<std::mutex> lock(mLock);
        return mSeen;
    }

private:
    mutable std::mutex mLock;
    V mSeen;
};

// A native callback object in the service's own process.
class NativeCallback : public BnInterface<IVideoCallEngineCallback> {
public:
    int notifyCallback(int event) override {
        mSeen.add("notify " + std::to_string(event));
        return 0;
    }
    int notifyCallback(int event, int a, int b, int c) override {
        mSeen.add("notify " + std::to_string(event) + " " + std::to_string(a) + " " +
                  std::to_string(b) + " " + std::to_string(c));
        return 0;
    }
    status_t onTransact(uint32_t code, const Parcel& data, Parcel* reply, uint32_t flags) override {
        mSeen.add("transact " + std::to_string(code));
        return BBinder::onTransact(code, data, reply, flags);
    }
    V seen() const { return mSeen.seen(); }

private:
    Sequence mSeen;
};

// A binder of the same process that is not a native object of the callback
// interface, as the Java side's binder objects are.
class ForeignBinder : public BBinder {
public:
    status_t onTransact(uint32_t code, const Parcel& data, Parcel* reply, uint32_t flags) override {
        mSeen.add(describe(code, data.data(), data.dataSize(), flags));
        reply->writeInt32(0);
        return NO_ERROR;
    }
    V seen() const { return mSeen.seen(); }

private:
    Sequence mSeen;
};

class CallbackTest : public ::testing::Test {
protected:
    CallbackTest() {
        hostfakes::reset();
        service = enginetest::service();
    }

    V logged(const char* tag) const {
        V out;
        for (const LogLine& l : log.linesWithTag(tag)) {
            out.push_back((l.priority == ANDROID_LOG_INFO ? "I " : "? ") + l.text);
        }
        return out;
    }
    size_t count(const char* tag, const std::string& text) const {
        return log.count(ANDROID_LOG_INFO, tag, text);
    }
    void setCallback(const sp<IBinder>& client) {
        const enginetest::Reply r = call(SET_CALLBACK, {}, client);
        ASSERT_EQ(NO_ERROR, r.status);
        ASSERT_EQ(0, r.value);
    }
    void cleanCallback() {
        const enginetest::Reply r = call(CLEAN_CALLBACK);
        ASSERT_EQ(NO_ERROR, r.status);
        ASSERT_EQ(4u, r.size);
        ASSERT_EQ(0, r.value);
    }
    // The media engine's event path and the video library's listener thread.
    static void mmeEvent(int event) {
        MmeEventObserver* observer = m_pMmeEventObserver.load();
        ASSERT_NE(nullptr, observer);
        observer->mmeEvtUpdate(event);
    }
    static void remoteVideoSize() { ASSERT_TRUE(hostfakes::fireZmfEvent(27, kRemoteSize)); }

    // A call in progress: camera open and the remote view shown.
    void startMedia() {
        ASSERT_EQ(0, call(SET_CAMERAID, {1}).value);
        ASSERT_EQ(0, call(SET_SURFACE, {0}, enginetest::remoteProducer()).value);
        ASSERT_EQ(1u, hostfakes::openCameras().size());
    }
    // Renders are removed on threads of their own: waits (up to a deadline)
    // until the render library holds exactly `ids`.
    static bool rendersBecome(const V& ids) {
        const auto deadline = std::chrono::steady_clock::now() + 5s;
        while (hostfakes::activeRenders() != ids) {
            if (std::chrono::steady_clock::now() > deadline) return false;
            std::this_thread::sleep_for(1ms);
        }
        return true;
    }
    void expectMediaEnded() {
        EXPECT_TRUE(hostfakes::openCameras().empty());
        EXPECT_TRUE(rendersBecome({})) << hostfakes::activeRenders().size() << " renders left";
    }

    LogCapture log;
    sp<IBinder> service;
};

}  // namespace

TEST_F(CallbackTest, MediaEngineEventsReachTheClientAsOneInteger) {
    sp<RemoteBinder> client = enginetest::remoteCallback();
    setCallback(client);
    EXPECT_EQ(1u, client->deathRecipientCount());
    EXPECT_EQ(V{}, received(*client));

    log.clear();
    mmeEvent(kRtpBreak);
    mmeEvent(kRtpReceived);
    mmeEvent(kRtpFirstPacket);
    EXPECT_EQ((V{"code 0 flags 0: 14", "code 0 flags 0: 15"}), received(*client));
    for (const RemoteBinder::Transaction& t : client->transactions()) EXPECT_EQ(4u, t.data.size());
    EXPECT_EQ((V{"I mmeEvtUpdate evt: 22", "I BpVideoCallEngineCallback notifyCallback, 14",
                 "I mmeEvtUpdate evt: 23", "I BpVideoCallEngineCallback notifyCallback, 15",
                 "I mmeEvtUpdate evt: 21"}),
              logged(kEngineTag));
}

TEST_F(CallbackTest, RemoteVideoSizeReachesTheClientAsFourIntegers) {
    sp<RemoteBinder> client = enginetest::remoteCallback();
    setCallback(client);

    log.clear();
    remoteVideoSize();
    ASSERT_TRUE(hostfakes::fireZmfEvent(
            28, "{\"Render\":\"Remote\",\"SourceType\":0,\"Window\":1,\"Width\":176,\"Height\":144}"));
    // A local source's size is not the remote party's.
    ASSERT_TRUE(hostfakes::fireZmfEvent(
            27, "{\"Render\":\"Local\",\"SourceType\":1,\"Window\":1,\"Width\":320,\"Height\":240}"));
    EXPECT_EQ((V{"code 1 flags 0: 11 640 480 0", "code 1 flags 0: 11 176 144 0"}), received(*client));
    for (const RemoteBinder::Transaction& t : client->transactions()) EXPECT_EQ(16u, t.data.size());
    EXPECT_EQ(1u, count(kEngineTag, kSizeSent));
    EXPECT_EQ(1u,
              count(kEngineTag, "BpVideoCallEngineCallback notifyCallback with data, 11, 176, 144, 0"));
}

TEST_F(CallbackTest, WithoutACallbackNotificationsAreDropped) {
    log.clear();
    mmeEvent(kRtpBreak);
    remoteVideoSize();
    EXPECT_EQ(2u, count(kEngineTag, "notifyCallback null"));

    // Cleared again after a client had one.
    sp<RemoteBinder> client = enginetest::remoteCallback();
    setCallback(client);
    cleanCallback();
    log.clear();
    mmeEvent(kRtpReceived);
    remoteVideoSize();
    EXPECT_EQ(2u, count(kEngineTag, "notifyCallback null"));
    EXPECT_EQ(V{}, received(*client));
}

TEST_F(CallbackTest, ANativeCallbackInTheSameProcessIsCalledDirectly) {
    sp<NativeCallback> native = new NativeCallback();
    setCallback(native);
    log.clear();
    mmeEvent(kRtpBreak);
    remoteVideoSize();
    EXPECT_EQ((V{"notify 14", "notify 11 640 480 0"}), native->seen());
    for (const std::string& line : logged(kEngineTag)) {
        EXPECT_EQ(std::string::npos, line.find("BpVideoCallEngineCallback")) << line;
    }

    // Any other binder of this process goes through a proxy and transact.
    sp<ForeignBinder> foreign = new ForeignBinder();
    setCallback(foreign);
    log.clear();
    mmeEvent(kRtpReceived);
    remoteVideoSize();
    EXPECT_EQ((V{"code 0 flags 0: 15", "code 1 flags 0: 11 640 480 0"}), foreign->seen());
    EXPECT_EQ(1u, count(kEngineTag, "BpVideoCallEngineCallback notifyCallback, 15"));
    EXPECT_EQ((V{"notify 14", "notify 11 640 480 0"}), native->seen());
}

TEST_F(CallbackTest, TheClientsDeathReleasesTheEngine) {
    sp<RemoteBinder> client = enginetest::remoteCallback();
    setCallback(client);
    startMedia();
    const int handle = hostfakes::openCameras().at(0);

    log.clear();
    const size_t mark = hostfakes::callCount();
    ASSERT_TRUE(client->kill());
    EXPECT_EQ(V{"I binderDied, ims app died"}, logged(kServiceTag));
    const V engine = logged(kEngineTag);
    ASSERT_FALSE(engine.empty());
    EXPECT_EQ("I release", engine.front());
    EXPECT_EQ("I release X", engine.back());
    EXPECT_THAT(hostfakes::callTextsSince(mark),
                Contains("camdrvStop(" + std::to_string(handle) + ") = 0"));
    expectMediaEnded();

    // The engine forgot the client: later events are dropped, not sent to the dead.
    log.clear();
    mmeEvent(kRtpBreak);
    EXPECT_EQ(1u, count(kEngineTag, "notifyCallback null"));
    EXPECT_EQ(0u, count(kEngineTag, "BpVideoCallEngineCallback notifyCallback, 14"));
}

TEST_F(CallbackTest, ASecondClientReleasesTheFirstsCallAndBothStayWatched) {
    sp<RemoteBinder> first = enginetest::remoteCallback();
    sp<RemoteBinder> second = enginetest::remoteCallback();
    setCallback(first);
    startMedia();

    log.clear();
    setCallback(second);
    EXPECT_EQ(V{"I VCE_ACTION_SET_CALLBACK"}, logged(kServiceTag));
    const V engine = logged(kEngineTag);
    ASSERT_GE(engine.size(), 3u);
    EXPECT_EQ(0u, engine[0].rfind("I setNotifyCallback, callback 0x", 0)) << engine[0];
    EXPECT_EQ("I VCE is not released as expected", engine[1]);
    EXPECT_EQ("I release", engine[2]);
    EXPECT_EQ("I release X", engine.back());
    expectMediaEnded();
    EXPECT_EQ(1u, first->deathRecipientCount());
    EXPECT_EQ(1u, second->deathRecipientCount());

    mmeEvent(kRtpBreak);
    EXPECT_EQ(V{}, received(*first));
    EXPECT_EQ(V{"code 0 flags 0: 14"}, received(*second));

    // The earlier client's death still releases the engine, and with it the later callback.
    log.clear();
    first->kill();
    EXPECT_EQ(V{"I binderDied, ims app died"}, logged(kServiceTag));
    EXPECT_EQ(1u, count(kEngineTag, "release X"));
    mmeEvent(kRtpBreak);
    EXPECT_EQ(1u, count(kEngineTag, "notifyCallback null"));
    EXPECT_EQ(1u, second->transactionCount());

    // So does the later client's.
    log.clear();
    second->kill();
    EXPECT_EQ(V{"I binderDied, ims app died"}, logged(kServiceTag));
    EXPECT_EQ(1u, count(kEngineTag, "release X"));
}

TEST_F(CallbackTest, CleanCallbackUnlinksAndClearsWithoutEndingTheCall) {
    // With no callback set it still answers and still tells the engine.
    log.clear();
    cleanCallback();
    EXPECT_EQ(V{"I VCE_ACTION_CLEAN_CALLBACK"}, logged(kServiceTag));
    EXPECT_EQ(V{"I setNotifyCallback, callback (nil)"}, logged(kEngineTag));

    sp<RemoteBinder> client = enginetest::remoteCallback();
    setCallback(client);
    startMedia();
    ASSERT_EQ(1u, client->deathRecipientCount());

    log.clear();
    cleanCallback();
    EXPECT_EQ(0u, client->deathRecipientCount());
    EXPECT_EQ(V{"I setNotifyCallback, callback (nil)"}, logged(kEngineTag));
    EXPECT_EQ(1u, hostfakes::openCameras().size());
    EXPECT_EQ(V{"Remote"}, hostfakes::activeRenders());

    mmeEvent(kRtpBreak);
    EXPECT_EQ(1u, count(kEngineTag, "notifyCallback null"));
    EXPECT_EQ(V{}, received(*client));

    // No longer watched: its death changes nothing.
    log.clear();
    client->kill();
    EXPECT_EQ(V{}, logged(kServiceTag));
    EXPECT_EQ(V{}, logged(kEngineTag));
    EXPECT_EQ(1u, hostfakes::openCameras().size());

    // A new client after a clean is no missing release.
    sp<RemoteBinder> next = enginetest::remoteCallback();
    log.clear();
    setCallback(next);
    EXPECT_EQ(0u, count(kEngineTag, "VCE is not released as expected"));
    EXPECT_EQ(1u, hostfakes::openCameras().size());
}

TEST_F(CallbackTest, ADeadCallbackDoesNotBlockNotifications) {
    sp<RemoteBinder> client = enginetest::remoteCallback();
    ASSERT_TRUE(client->kill());
    // Set after its process died: the death link cannot be made.
    setCallback(client);
    EXPECT_EQ(0u, client->deathRecipientCount());

    log.clear();
    auto notified = std::async(std::launch::async, [] {
        mmeEvent(kRtpBreak);
        remoteVideoSize();
    });
    ASSERT_EQ(std::future_status::ready, notified.wait_for(10s));
    EXPECT_EQ(1u, count(kEngineTag, "BpVideoCallEngineCallback notifyCallback, 14"));
    EXPECT_EQ(1u, count(kEngineTag, kSizeSent));
    EXPECT_EQ(0u, count(kEngineTag, "notifyCallback null"));
    EXPECT_EQ(0u, client->transactionCount());
    EXPECT_EQ(V{}, logged(kServiceTag));
}

TEST_F(CallbackTest, ACallbackChangeWaitsForTheNotificationInProgress) {
    Sequence order;
    auto slowClient = [&order] {
        return sp<RemoteBinder>(new RemoteBinder(
                [&order](uint32_t, const Parcel& data, Parcel* reply, uint32_t) {
                    std::this_thread::sleep_for(300ms);
                    order.add("client answered " + std::to_string(data.readInt32()));
                    reply->writeInt32(0);
                    return NO_ERROR;
                },
                String16("android.videocallengine.callback")));
    };

    // Clearing the callback.
    sp<RemoteBinder> first = slowClient();
    setCallback(first);
    std::thread events([] { mmeEvent(kRtpBreak); });
    ASSERT_TRUE(first->waitForTransactions(1, 10s));
    cleanCallback();
    order.add("callback cleared");
    events.join();

    // Replacing it with another client's.
    setCallback(first);
    sp<RemoteBinder> second = enginetest::remoteCallback();
    events = std::thread([] { mmeEvent(kRtpReceived); });
    ASSERT_TRUE(first->waitForTransactions(2, 10s));
    setCallback(second);
    order.add("callback replaced");
    events.join();

    EXPECT_EQ((V{"client answered 14", "callback cleared", "client answered 15", "callback replaced"}),
              order.seen());
    EXPECT_EQ(V{}, received(*second));
}

TEST_F(CallbackTest, NotificationsRaceCallbackChangesSafely) {
    sp<RemoteBinder> first = enginetest::remoteCallback();
    sp<RemoteBinder> second = enginetest::remoteCallback();
    constexpr int kRounds = 100;
    std::thread events([] {
        for (int i = 0; i < kRounds; ++i) {
            mmeEvent(i % 2 == 0 ? kRtpBreak : kRtpReceived);
            remoteVideoSize();
        }
    });
    for (int i = 0; i < kRounds / 2; ++i) {
        setCallback(i % 2 == 0 ? first : second);
        cleanCallback();
    }
    events.join();

    // Whatever interleaving happened, every delivery was whole.
    for (const sp<RemoteBinder>& client : {first, second}) {
        for (const RemoteBinder::Transaction& t : client->transactions()) {
            EXPECT_EQ(t.code == 0 ? 4u : 16u, t.data.size());
            EXPECT_EQ(0u, t.flags);
        }
        EXPECT_EQ(0u, client->deathRecipientCount());
    }
    log.clear();
    mmeEvent(kRtpBreak);
    EXPECT_EQ(1u, count(kEngineTag, "notifyCallback null"));
}
