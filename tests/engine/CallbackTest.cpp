// The client's callback seen from the client: what reaches it on the wire,
// a callback living in the service's own process, and the death of the
// client's process. How notifications and callback changes order themselves
// is ClientFaultTest's part; the remote video size's path from the video
// library is ListenerTest's part.
#include <binder/IInterface.h>

#include "EngineTestUtil.h"
#include "IVideoCallEngineCallback.h"

using namespace android;
using namespace enginecase;
using enginetest::call;
using hostbinder::RemoteBinder;

namespace {

// Media engine stream events: first packet, RTP break, RTP received.
constexpr int kRtpFirstPacket = 21, kRtpBreak = 22, kRtpReceived = 23;
const char* const kSizeSent = "BpVideoCallEngineCallback notifyCallback with data, 11, 640, 480, 0";

// These two are called on the thread that delivers the event, here the test's.
// A native callback object in the service's own process.
class NativeCallback : public BnInterface<IVideoCallEngineCallback> {
public:
    int notifyCallback(int event) override {
        seen.push_back("notify " + std::to_string(event));
        return 0;
    }
    int notifyCallback(int event, int a, int b, int c) override {
        seen.push_back("notify " + std::to_string(event) + " " + std::to_string(a) + " " + std::to_string(b) +
                       " " + std::to_string(c));
        return 0;
    }
    Strings seen;
};

// A binder of the same process that is not a native object of the callback
// interface, as the Java side's binder objects are.
class ForeignBinder : public BBinder {
public:
    status_t onTransact(uint32_t code, const Parcel& data, Parcel* reply, uint32_t flags) override {
        seen.push_back(describe(code, data.data(), data.dataSize(), flags));
        reply->writeInt32(0);
        return NO_ERROR;
    }
    Strings seen;
};

class CallbackTest : public FreshServiceCase {
protected:
    // The replies' form is ServiceTest's part.
    static void setCallback(const sp<IBinder>& client) { ASSERT_EQ(0, call(kSetCallback, {}, client).value); }
    static void remoteVideoSize() { ASSERT_TRUE(hostfakes::fireZmfEvent(27, kRemoteSize)); }
    // A call in progress: camera open and the remote view shown.
    static void startMedia() {
        ASSERT_EQ(0, call(kCameraId, {1}).value);
        ASSERT_EQ(0, call(kSetSurface, {kRemoteView}, enginetest::remoteProducer()).value);
    }
    static void expectMediaEnded() {
        EXPECT_TRUE(hostfakes::openCameras().empty());
        EXPECT_TRUE(eventually([] { return hostfakes::activeRenders().empty(); })) << "renders left";
    }
};

}  // namespace

TEST_F(CallbackTest, EventsReachAClientThroughTheProxyAndANativeCallbackDirectly) {
    // Media engine stream events reach the client's process as one integer.
    sp<RemoteBinder> client = enginetest::remoteCallback();
    setCallback(client);
    mark();
    mmeEvent(kRtpBreak);
    mmeEvent(kRtpReceived);
    mmeEvent(kRtpFirstPacket);  // the engine's own: not the client's
    EXPECT_EQ((Strings{"code 0 flags 0: 14", "code 0 flags 0: 15"}), received(*client));
    EXPECT_EQ((Strings{"I mmeEvtUpdate evt: 22", "I BpVideoCallEngineCallback notifyCallback, 14",
                       "I mmeEvtUpdate evt: 23", "I BpVideoCallEngineCallback notifyCallback, 15",
                       "I mmeEvtUpdate evt: 21"}),
              linesOf(kEngineTag));

    // A native callback object in this process is called directly.
    sp<NativeCallback> native = new NativeCallback();
    setCallback(native);
    mark();
    mmeEvent(kRtpBreak);
    remoteVideoSize();
    EXPECT_EQ((Strings{"notify 14", "notify 11 640 480 0"}), native->seen);
    EXPECT_EQ(0u, count(kEngineTag, "BpVideoCallEngineCallback notifyCallback, 14"));
    EXPECT_EQ(0u, count(kEngineTag, kSizeSent));

    // Any other binder of this process goes through a proxy and transact.
    sp<ForeignBinder> foreign = new ForeignBinder();
    setCallback(foreign);
    mark();
    mmeEvent(kRtpReceived);
    remoteVideoSize();
    EXPECT_EQ((Strings{"code 0 flags 0: 15", "code 1 flags 0: 11 640 480 0"}), foreign->seen);
    EXPECT_EQ(1u, count(kEngineTag, "BpVideoCallEngineCallback notifyCallback, 15"));
    EXPECT_EQ(2u, native->seen.size());
}

// Covers a client's death too: the engine is released whichever of the
// watched clients dies, and forgets the callback.
TEST_F(CallbackTest, ASecondClientReleasesTheFirstsCallAndBothStayWatched) {
    sp<RemoteBinder> first = enginetest::remoteCallback();
    sp<RemoteBinder> second = enginetest::remoteCallback();
    setCallback(first);
    startMedia();

    mark();
    setCallback(second);
    EXPECT_EQ(Strings{"I VCE_ACTION_SET_CALLBACK"}, linesOf(kServiceTag));
    const Strings engine = linesOf(kEngineTag);
    ASSERT_GE(engine.size(), 3u);
    EXPECT_EQ(0u, engine[0].rfind("I setNotifyCallback, callback 0x", 0)) << engine[0];
    EXPECT_EQ((Strings{"I VCE is not released as expected", "I release"}),
              Strings(engine.begin() + 1, engine.begin() + 3));
    EXPECT_EQ("I release X", engine.back());
    expectMediaEnded();
    mmeEvent(kRtpBreak);
    EXPECT_EQ(Strings{}, received(*first));
    EXPECT_EQ(Strings{"code 0 flags 0: 14"}, received(*second));

    // The earlier client's death still releases the engine, and with it the later callback.
    startMedia();
    mark();
    ASSERT_TRUE(first->kill());
    EXPECT_EQ(Strings{"I binderDied, ims app died"}, linesOf(kServiceTag));
    EXPECT_EQ("I release", linesOf(kEngineTag).at(0));
    expectMediaEnded();
    mmeEvent(kRtpBreak);
    EXPECT_EQ(1u, count(kEngineTag, "notifyCallback null"));
    EXPECT_EQ(1u, second->transactionCount());

    // So does the later client's.
    mark();
    second->kill();
    EXPECT_EQ(Strings{"I binderDied, ims app died"}, linesOf(kServiceTag));
    EXPECT_EQ(1u, count(kEngineTag, "release X"));
}

TEST_F(CallbackTest, CleanCallbackUnlinksAndClearsWithoutEndingTheCall) {
    sp<RemoteBinder> client = enginetest::remoteCallback();
    setCallback(client);
    startMedia();
    mark();
    ASSERT_EQ(0, call(kCleanCallback).value);
    EXPECT_EQ(0u, client->deathRecipientCount());
    mmeEvent(kRtpBreak);
    EXPECT_EQ(1u, count(kEngineTag, "notifyCallback null"));

    // No longer watched: its death changes nothing.
    mark();
    client->kill();
    EXPECT_EQ(Strings{}, linesOf(kServiceTag));
    EXPECT_EQ(Strings{}, linesOf(kEngineTag));

    // A new client after a clean is no missing release.
    setCallback(enginetest::remoteCallback());
    EXPECT_EQ(0u, count(kEngineTag, "VCE is not released as expected"));
    EXPECT_EQ(1u, hostfakes::openCameras().size());
    EXPECT_EQ(Strings{"Remote"}, hostfakes::activeRenders());
}
