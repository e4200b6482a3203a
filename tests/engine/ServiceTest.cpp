// The binder service as an IMS client reaches it: registration, the reply
// and status of every transaction code, the fields each code reads (also
// from truncated requests), and which engine operation each one reaches.
// What the operations then do is the camera, render and callback suites' part.
#include <binder/IServiceManager.h>
#include <gmock/gmock.h>
#include <utils/String16.h>

#include <future>

#include "EngineTestUtil.h"
#include "MmeJni.h"
#include "Mvd.h"
#include "VideoCallEngineService.h"

using namespace android;
using namespace enginecase;
using enginetest::call;
using enginetest::Reply;
using ::testing::Contains;
using ::testing::Not;
using ::testing::StartsWith;

namespace {

const String16 kServiceName("VideoCallEngineService");
const Strings kEngineStart{"Zmf_OnIntialize() = 0", "Zmf_VideoSetListener(listener) = 0",
                           "camdrvInit(\"com.tessaroval.vce\", 24, \"system/lib64\") = 0",
                           "renderInit() = 0"};

// A reply as one comparable text, so a mismatch shows every part at once.
std::string show(const Reply& r) {
    return "status " + std::to_string(r.status) + ", int32 " + std::to_string(r.value) + ", " +
           std::to_string(r.size) + " bytes";
}
// What the service answers to a request it handles itself.
std::string answer(int32_t value) { return show(Reply{NO_ERROR, value, sizeof(int32_t)}); }

class ServiceTest : public FreshServiceCase {};

}  // namespace

// The registration starts the engine once. The engine held by each service
// object outlives any one of them but not the last, which unregisters it from
// everything that delivers events.
TEST_F(ServiceTest, TheEngineStartsOnceAndLivesWhileAnyServiceObjectDoesAndStartsAgainAfter) {
    ASSERT_NE(nullptr, service);
    EXPECT_EQ(service, defaultServiceManager()->checkService(kServiceName));
    EXPECT_EQ((Strings{"I Instantiate", "I create", "I Instantiate, ret = 0"}), linesOf(kServiceTag));
    EXPECT_EQ((Strings{"I Create new Instance", "I Construct", "I loadZmf"}), linesOf(kEngineTag));
    EXPECT_EQ(kEngineStart, hostfakes::callTexts());

    // A service object made and dropped at once, as a failed registration does.
    mark();
    { sp<VideoCallEngineService> transient = new VideoCallEngineService(); }
    EXPECT_EQ((Strings{"I create", "I destory"}), linesOf(kServiceTag));
    EXPECT_THAT(linesOf(kEngineTag), Not(Contains("I Destruct")));

    // A second registration replaces the first object under the same name;
    // the first goes with its last reference, the engine stays.
    EXPECT_EQ(NO_ERROR, VideoCallEngineService::instantiate());
    sp<IBinder> second = defaultServiceManager()->checkService(kServiceName);
    EXPECT_NE(service, second);
    mark();
    service.clear();
    EXPECT_EQ(Strings{"I destory"}, linesOf(kServiceTag));
    EXPECT_EQ(Strings{}, linesOf(kEngineTag));
    EXPECT_EQ(Strings{}, calls());

    // The registered object drives the engine, its events still arrive, and
    // it watches the client it was given.
    sp<hostbinder::RemoteBinder> client = enginetest::remoteCallback();
    EXPECT_EQ(answer(0), show(call(kSetCallback, {}, client)));
    mmeEvent(22);
    EXPECT_EQ(1u, client->transactionCount());
    client->kill();
    EXPECT_THAT(linesOf(kServiceTag), Contains("I binderDied, ims app died"));
    EXPECT_THAT(linesOf(kEngineTag), Contains("I release X"));

    // Replacing the registration with an unrelated binder drops the last service object.
    mark();
    ASSERT_EQ(NO_ERROR, defaultServiceManager()->addService(kServiceName, new BBinder()));
    second.clear();
    EXPECT_EQ(Strings{"I destory"}, linesOf(kServiceTag));
    EXPECT_THAT(linesOf(kEngineTag), Contains("I Destruct"));
    EXPECT_EQ((Strings{"camdrvTerm() = 0", "renderTerm() = 0", "Zmf_VideoSetListener(NULL) = 0",
                       "Zmf_OnTerminate() = 0"}),
              calls());
    EXPECT_EQ(nullptr, m_pMmeEventObserver.load());

    // The next registration starts a new engine, whose events arrive.
    mark();
    EXPECT_EQ(NO_ERROR, VideoCallEngineService::instantiate());
    EXPECT_THAT(linesOf(kEngineTag), Contains("I Create new Instance"));
    EXPECT_EQ(kEngineStart, calls());
    client = enginetest::remoteCallback();
    EXPECT_EQ(answer(0), show(call(kSetCallback, {}, client)));
    mmeEvent(23);
    EXPECT_EQ(1u, client->transactionCount());
}

// One request per row, in this order on one engine. Rows that reach no
// engine operation must not log there nor call the platform.
TEST_F(ServiceTest, EachCodeReadsItsFieldsAnswersAndReachesItsOperation) {
    struct Case {
        uint32_t code;
        std::vector<int32_t> ints;  // fewer than the code reads: a truncated request (missing reads as 0)
        Strings service;
        Strings engine;  // the engine's first lines
        int32_t answer = 0;
        bool producer = false;
        const char* text = nullptr;
    };
    const char* const image = "/sdcard/img.jpg";
    const char* const hideLine = "I VCE_ACTION_HIDE_LOCAL_IMAGE";
    const char* const shownLine = "I hideLocalImage, enable = 0, path = (null)";
    auto refused = [](int target) {
        return "E VCE_ACTION_SET_SURFACE, target " + std::to_string(target) + ", producer is null, refused";
    };
    // One row a line.
    // clang-format off
    const Case cases[] = {
            // With the engine present, code 0 only answers: the start-up is not repeated.
            {kInit, {1, 2}, {"I VCE_ACTION_INIT"}, {}},
            {kSetCallback, {}, {"I VCE_ACTION_SET_CALLBACK"}, {"I setNotifyCallback, callback (nil)"}},
            {kCleanCallback, {}, {"I VCE_ACTION_CLEAN_CALLBACK"}, {"I setNotifyCallback, callback (nil)"}},
            {kEngineInit, {}, {}, {"I init, loopback? 0 E", "I init, loopback? 0 X"}},
            {kCameraSize, {}, {"I VCE_ACTION_SET_CAMERASIZE"}, {"I setCameraPreviewSize"}},
            {kOrientation, {}, {"I VCE_ACTION_DISPLAY_ORIENTATION"},
             {"I setDisplayOrientation, device: 0 -> 0, screen: 0 -> 0, auto_rotate: 1 -> 0"}},
            {kOrientation, {90, 1, 0}, {"I VCE_ACTION_DISPLAY_ORIENTATION"},
             {"I setDisplayOrientation, device: 0 -> 90, screen: 0 -> 1, auto_rotate: 0 -> 0"}},
            {kUplinkQos, {}, {"I VCE_ACTION_SET_UPLINK_QOS"}, {"I setUplinkQos, ignore 0"}},
            {kUplinkQos, {384}, {"I VCE_ACTION_SET_UPLINK_QOS"}, {"I setUplinkQos, 384 kbitps"}},
            // Only hide 1 reads the image's name; other values mean "show".
            {kHideImage, {1}, {hideLine}, {"I hideLocalImage, enable = 1, path = /sdcard/img.jpg"}, 0, false,
             image},
            {kHideImage, {2}, {hideLine}, {shownLine}, 0, false, image},
            {kHideImage, {}, {hideLine}, {shownLine}},
            // Hide 1 without the name: nothing to send instead of the camera.
            {kHideImage, {1}, {hideLine, "E VCE_ACTION_HIDE_LOCAL_IMAGE, image path missing, refused"}, {}},
            // Nothing left to end.
            {kRelease, {}, {"I VCE_ACTION_RELEASE"},
             {"I release", "I setRemoteSurface", "I setRemoteSurface null", "I setRemoteSurface X",
              "I setPreviewSurface", "I setPreviewSurface null", "I setPreviewSurface X",
              "I setCameraId -1, camera is closed", "I release X"}},
            {kCleanSurface, {kRemoteView}, {"I VCE_ACTION_CLEAN_SURFACE, Remote"}, {"I setRemoteSurface"}},
            {kCleanSurface, {kLocalView}, {"I VCE_ACTION_CLEAN_SURFACE, Local"}, {"I setPreviewSurface"}},
            {kCleanSurface, {2}, {}, {}},
            {kCleanSurface, {-1}, {}, {}},
            {kCameraId, {-1}, {"I VCE_ACTION_SET_CAMERAID"}, {"I setCameraId -1, camera is closed"}},
            // Codes without an operation of their own.
            {14, {1, 2}, {}, {}},
            {15, {}, {}, {}},
            {18, {7}, {}, {}},
            // A missing producer is refused rather than read as "clear the view".
            {kSetSurface, {}, {refused(0)}, {}, BAD_VALUE},
            {kSetSurface, {kLocalView}, {refused(1)}, {}, BAD_VALUE},
            {kSetSurface, {5}, {refused(5)}, {}, BAD_VALUE},
            {kSetSurface, {2}, {}, {}, 0, true},
            {kSetSurface, {-1}, {}, {}, 0, true},
            {kSetSurface, {kRemoteView}, {"I VCE_ACTION_SET_SURFACE, Remote"},
             {"I setRemoteSurface", "I setRemoteSurface add Render"}, 0, true},
            {kSetSurface, {kLocalView}, {"I VCE_ACTION_SET_SURFACE, Local"},
             {"I setPreviewSurface", "I setPreviewSurface add Render, camera is not opened"}, 0, true},
            // Camera id 0 is a real camera: the empty request opens the back camera.
            {kCameraId, {}, {"I VCE_ACTION_SET_CAMERAID"}, {"I setCameraId 0, open camera"}},
    };
    // clang-format on
    for (const Case& c : cases) {
        SCOPED_TRACE("code " + std::to_string(c.code) + ", " + std::to_string(c.ints.size()) + " ints");
        mark();
        Parcel request;
        for (int32_t v : c.ints) request.writeInt32(v);
        if (c.producer) request.writeStrongBinder(enginetest::remoteProducer());
        if (c.text != nullptr) request.writeCString(c.text);
        EXPECT_EQ(answer(c.answer), show(call(c.code, request)));
        EXPECT_EQ(c.service, linesOf(kServiceTag));
        const Strings engine = linesOf(kEngineTag);
        EXPECT_EQ(c.engine,
                  Strings(engine.begin(), engine.begin() + std::min(engine.size(), c.engine.size())));
        if (c.engine.empty()) {
            EXPECT_EQ(Strings{}, engine);
            EXPECT_EQ(Strings{}, calls());
        }
    }
    EXPECT_THAT(calls(), Contains(StartsWith(std::string("camdrvOpen(\"") + kBack + "\", 0, ")));

    // Two bytes are not an int32: nothing of them is read as a value (loopback 1).
    const uint8_t twoBytes[] = {0x01, 0x00};
    Parcel shortRequest;
    shortRequest.setData(twoBytes, sizeof(twoBytes));
    mark();
    EXPECT_EQ(answer(0), show(call(kEngineInit, shortRequest)));
    EXPECT_EQ("I init, loopback? 0 E", linesOf(kEngineTag).at(0));
}

TEST_F(ServiceTest, OtherCodesGetThePlatformsDefaultHandling) {
    for (uint32_t code : {5u, 12u, 19u, 0x7FFFFFFFu, 0x80000000u, 0xFFFFFFFFu}) {
        SCOPED_TRACE("code " + std::to_string(static_cast<int32_t>(code)));
        mark();
        EXPECT_EQ(show(Reply{UNKNOWN_TRANSACTION, 0, 0}), show(call(code, {1, 2, 3})));
        EXPECT_EQ(Strings{}, linesOf(kServiceTag));
        EXPECT_EQ(Strings{}, linesOf(kEngineTag));
        EXPECT_EQ(Strings{}, calls());
    }
    // The default handling is the base's, which knows the interface query:
    // the service has no descriptor of its own.
    Parcel empty, reply;
    EXPECT_EQ(NO_ERROR, service->transact(IBinder::INTERFACE_TRANSACTION, empty, &reply));
    EXPECT_EQ(String16(), reply.readString16());
}

// An event already inside the engine when the last service object goes: the
// engine is deleted only once the event is done with it.
TEST_F(ServiceTest, TheEngineOutlivesTheEventsInsideItWhenItIsDeleted) {
    ASSERT_EQ(0, Mvd_EvntSetCallback(Mvd_EvntProc, 1));
    const struct {
        const char* entered;  // the engine's first line for the event
        bool (*deliver)();
    } paths[] = {
            {"mmeEvtUpdate evt: 22", [] { return hostfakes::fireMvdEvent(tagMVD_EVNT{{22}}) == 0; }},
            {"zmfRenderEvtUpdate, evt:28 [Remote], type 0, [640x480]",
             [] { return hostfakes::fireZmfEvent(27, kRemoteSize); }},
    };
    for (const auto& path : paths) {
        SCOPED_TRACE(path.entered);
        mark();
        log.holdAt(ANDROID_LOG_INFO, kEngineTag, path.entered);
        auto event = std::async(std::launch::async, path.deliver);
        ASSERT_TRUE(log.waitFor(ANDROID_LOG_INFO, kEngineTag, path.entered));
        // The last service object goes while the event is held inside the engine.
        auto deleted = std::async(std::launch::async, [this] {
            defaultServiceManager()->addService(kServiceName, new BBinder());
            service.clear();
        });
        ASSERT_TRUE(log.waitFor(ANDROID_LOG_INFO, kEngineTag, "Destruct"));
        deleted.wait_for(std::chrono::milliseconds(300));  // room for a deletion that does not wait
        log.letGo();
        EXPECT_TRUE(event.get());
        deleted.get();
        Strings order;
        for (const LogLine& line : log.lines()) order.push_back(line.text);
        EXPECT_TRUE(inOrder(order, {"Destruct", "notifyCallback null", "zmfTerminate"}));

        ASSERT_EQ(NO_ERROR, VideoCallEngineService::instantiate());
        service = defaultServiceManager()->checkService(kServiceName);
    }
}

// Service objects made and dropped on several threads at once, with no other
// holding the engine: each sees a live engine, and every engine made is deleted.
TEST_F(ServiceTest, ServiceObjectsComingAndGoingAtOnceShareOnlyLiveEngines) {
    ASSERT_EQ(NO_ERROR, defaultServiceManager()->addService(kServiceName, new BBinder()));
    service.clear();
    constexpr int kRounds = 2000;
    auto churn = [] {
        for (int i = 0; i < kRounds; ++i) {
            sp<VideoCallEngineService> transient = new VideoCallEngineService();
            ASSERT_EQ(-1, transient->mVideoCallEngineImpl->mOpenCameraId);
        }
    };
    std::vector<std::thread> others;
    for (int t = 0; t < 3; ++t) others.emplace_back(churn);
    churn();
    for (std::thread& t : others) t.join();
    EXPECT_EQ(count(kEngineTag, "Construct"), count(kEngineTag, "Destruct"));
    EXPECT_EQ(nullptr, m_pMmeEventObserver.load());
}
