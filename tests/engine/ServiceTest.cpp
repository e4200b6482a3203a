// The binder service as an IMS client reaches it: registration, the reply
// and status of every transaction code, the fields each code reads (also
// from truncated requests), and which engine operation each one reaches.
#include <android/log.h>
#include <binder/IServiceManager.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <utils/String16.h>

#include <chrono>
#include <cstdint>
#include <string>
#include <thread>
#include <vector>

#include "EngineHarness.h"
#include "HostFakes.h"
#include "LogCapture.h"
#include "MmeEventObserver.h"
#include "VideoCallEngineService.h"

using namespace android;
using enginetest::call;
using enginetest::Reply;
using hostbinder::RemoteBinder;
using ::testing::Contains;
using ::testing::Not;
using ::testing::StartsWith;
using V = std::vector<std::string>;

namespace {

constexpr const char* kServiceTag = "VideoCallEngineService";
constexpr const char* kEngineTag = "VideoCallEngineImpl";
const char* const kFront = "Camera 1, Facing front, Orientation 270";
const char* const kBack = "Camera 0, Facing back, Orientation 90";
const String16 kServiceName("VideoCallEngineService");

enum : uint32_t {
    INIT = 0, SET_SURFACE = 1, SET_CALLBACK = 2, CLEAN_CALLBACK = 3, ENGINE_INIT = 4,
    CLEAN_SURFACE = 7, RELEASE = 8, SET_CAMERAID = 9, SET_CAMERASIZE = 10,
    DISPLAY_ORIENTATION = 11, HIDE_LOCAL_IMAGE = 16, SET_UPLINK_QOS = 17,
};
enum : int32_t { REMOTE = 0, LOCAL = 1 };

// A reply as one comparable text, so a mismatch shows every part at once.
std::string show(const Reply& r) {
    return "status " + std::to_string(r.status) + ", int32 " + std::to_string(r.value) + ", " +
           std::to_string(r.size) + " bytes";
}
// What the service answers to a request it handles itself.
std::string answer(int32_t value) { return show(Reply{NO_ERROR, value, sizeof(int32_t)}); }

Reply callWith(uint32_t code, const std::vector<int32_t>& ints) {
    Parcel p;
    for (int32_t v : ints) p.writeInt32(v);
    return call(code, p);
}

class ServiceTest : public ::testing::Test {
protected:
    // The record is reset before the first lookup registers the service, so
    // each case (a process of its own) sees the engine's start-up.
    ServiceTest() {
        hostfakes::reset();
        binder = enginetest::service();
    }

    // Lines of `tag`, each as "<I|E> <text>".
    V logged(const char* tag) const {
        V out;
        for (const LogLine& l : log.linesWithTag(tag)) {
            const char* p = l.priority == ANDROID_LOG_INFO    ? "I "
                            : l.priority == ANDROID_LOG_ERROR ? "E "
                                                              : "? ";
            out.push_back(p + l.text);
        }
        return out;
    }
    // Starts a fresh view of the log and of the platform calls.
    void mark() {
        log.clear();
        start = hostfakes::callCount();
    }
    V calls() const { return hostfakes::callTextsSince(start); }
    // Renders are removed on threads of their own: waits (up to a deadline)
    // until the render library holds exactly `ids`.
    static bool rendersBecome(const V& ids) {
        const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(5);
        while (hostfakes::activeRenders() != ids) {
            if (std::chrono::steady_clock::now() > deadline) return false;
            std::this_thread::sleep_for(std::chrono::milliseconds(1));
        }
        return true;
    }

    // Opens the front camera and gives both surfaces, as a call in progress has them.
    void startMedia(const sp<IBinder>& remote, const sp<IBinder>& preview) {
        ASSERT_EQ(answer(0), show(call(SET_CAMERAID, {1})));
        ASSERT_EQ(answer(0), show(call(SET_SURFACE, {REMOTE}, remote)));
        ASSERT_EQ(answer(0), show(call(SET_SURFACE, {LOCAL}, preview)));
        ASSERT_EQ((V{kFront, "Remote"}), hostfakes::activeRenders());
    }

    LogCapture log;
    sp<IBinder> binder;
    size_t start = 0;
};

}  // namespace

TEST_F(ServiceTest, InstantiateRegistersTheServiceAndStartsTheEngineOnce) {
    ASSERT_NE(nullptr, binder);
    EXPECT_EQ(binder, defaultServiceManager()->checkService(kServiceName));
    EXPECT_EQ((V{"I Instantiate", "I create", "I Instantiate, ret = 0"}), logged(kServiceTag));
    EXPECT_EQ((V{"I Create new Instance", "I Construct", "I loadZmf"}), logged(kEngineTag));
    EXPECT_EQ((V{"Zmf_OnIntialize() = 0", "Zmf_VideoSetListener(listener) = 0",
                 "camdrvInit(\"com.tessaroval.vce\", 24, \"system/lib64\") = 0", "renderInit() = 0"}),
              hostfakes::callTexts());
    EXPECT_NE(nullptr, m_pMmeEventObserver.load());

    // With the engine present, code 0 only answers: the start-up is not repeated.
    mark();
    EXPECT_EQ(answer(0), show(call(INIT)));
    EXPECT_EQ(answer(0), show(call(INIT, {1, 2})));
    EXPECT_EQ((V{"I VCE_ACTION_INIT", "I VCE_ACTION_INIT"}), logged(kServiceTag));
    EXPECT_EQ(V{}, logged(kEngineTag));
    EXPECT_EQ(V{}, calls());
}

TEST_F(ServiceTest, EveryHandledCodeLogsItsLineAndAnswersZero) {
    struct Case {
        uint32_t code;
        std::vector<int32_t> ints;
        const char* serviceLine;  // null: the service logs nothing
        const char* engineLine;   // the engine's first line; null: the engine is not reached
    };
    const Case cases[] = {
        {INIT, {}, "VCE_ACTION_INIT", nullptr},
        {SET_CALLBACK, {}, "VCE_ACTION_SET_CALLBACK", "setNotifyCallback, callback (nil)"},
        {CLEAN_CALLBACK, {}, "VCE_ACTION_CLEAN_CALLBACK", "setNotifyCallback, callback (nil)"},
        {ENGINE_INIT, {0}, nullptr, "init, loopback? 0 E"},
        {CLEAN_SURFACE, {REMOTE}, "VCE_ACTION_CLEAN_SURFACE, Remote", "setRemoteSurface"},
        {CLEAN_SURFACE, {LOCAL}, "VCE_ACTION_CLEAN_SURFACE, Local", "setPreviewSurface"},
        {RELEASE, {}, "VCE_ACTION_RELEASE", "release"},
        {SET_CAMERAID, {-1}, "VCE_ACTION_SET_CAMERAID", "setCameraId -1, camera is closed"},
        {SET_CAMERASIZE, {2}, "VCE_ACTION_SET_CAMERASIZE", "setCameraPreviewSize"},
        {DISPLAY_ORIENTATION, {0, 0, 1}, "VCE_ACTION_DISPLAY_ORIENTATION",
         "setDisplayOrientation, device: 0 -> 0, screen: 0 -> 0, auto_rotate: 1 -> 1"},
        {14, {1, 2}, nullptr, nullptr},
        {15, {}, nullptr, nullptr},
        {HIDE_LOCAL_IMAGE, {0}, "VCE_ACTION_HIDE_LOCAL_IMAGE",
         "hideLocalImage, enable = 0, path = (null)"},
        {SET_UPLINK_QOS, {384}, "VCE_ACTION_SET_UPLINK_QOS", "setUplinkQos, 384 kbitps"},
        {18, {7}, nullptr, nullptr},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE("code " + std::to_string(c.code));
        mark();
        EXPECT_EQ(answer(0), show(callWith(c.code, c.ints)));
        EXPECT_EQ(c.serviceLine != nullptr ? V{std::string("I ") + c.serviceLine} : V{},
                  logged(kServiceTag));
        const V engine = logged(kEngineTag);
        if (c.engineLine == nullptr) {
            EXPECT_EQ(V{}, engine);
        } else {
            ASSERT_FALSE(engine.empty());
            EXPECT_EQ(std::string("I ") + c.engineLine, engine.front());
        }
    }
}

TEST_F(ServiceTest, OtherCodesGetThePlatformsDefaultHandling) {
    const uint32_t unknown[] = {5, 6, 12, 13, 19, 1000, 0x7FFFFFFF, 0x80000000u, 0xFFFFFFFFu};
    for (uint32_t code : unknown) {
        SCOPED_TRACE("code " + std::to_string(static_cast<int32_t>(code)));
        mark();
        EXPECT_EQ(show(Reply{UNKNOWN_TRANSACTION, 0, 0}), show(call(code, {1, 2, 3})));
        EXPECT_EQ(V{}, logged(kServiceTag));
        EXPECT_EQ(V{}, logged(kEngineTag));
        EXPECT_EQ(V{}, calls());
    }

    // The default handling is the base's, which knows the interface query:
    // the service has no descriptor of its own.
    Parcel empty;
    Parcel reply;
    EXPECT_EQ(NO_ERROR, binder->transact(IBinder::INTERFACE_TRANSACTION, empty, &reply));
    EXPECT_EQ(String16(), reply.readString16());
    EXPECT_EQ(String16(), binder->getInterfaceDescriptor());
}

TEST_F(ServiceTest, CameraIdAnswersWhatTheEngineReturns) {
    mark();
    EXPECT_EQ(answer(0), show(call(SET_CAMERAID, {1})));
    EXPECT_THAT(calls(),
                Contains(StartsWith(std::string("camdrvOpen(\"") + kFront + "\", 1, 1, 270, ")));
    ASSERT_EQ(1u, hostfakes::openCameras().size());
    const int handle = hostfakes::openCameras()[0];

    mark();
    EXPECT_EQ(answer(0), show(call(SET_CAMERAID, {-1})));
    EXPECT_THAT(calls(), Contains("camdrvStop(" + std::to_string(handle) + ") = 0"));
    EXPECT_TRUE(hostfakes::openCameras().empty());

    hostfakes::setResult("camdrvOpen", 0);
    mark();
    EXPECT_EQ(answer(-1), show(call(SET_CAMERAID, {0})));
    EXPECT_THAT(logged(kEngineTag), Contains("I setCameraId, startCapture failed"));
    EXPECT_TRUE(hostfakes::openCameras().empty());

    hostfakes::clearResult("camdrvOpen");
    mark();
    EXPECT_EQ(answer(0), show(call(SET_CAMERAID, {0})));
    EXPECT_THAT(calls(), Contains(StartsWith(std::string("camdrvOpen(\"") + kBack + "\", 0, -1, 90, ")));
}

TEST_F(ServiceTest, RequestFieldsReachTheEngineInTheirOrder) {
    mark();
    EXPECT_EQ(answer(0), show(call(DISPLAY_ORIENTATION, {90, 1, 0})));
    EXPECT_THAT(logged(kEngineTag),
                Contains("I setDisplayOrientation, device: 0 -> 90, screen: 0 -> 1, auto_rotate: 1 -> 0"));

    mark();
    EXPECT_EQ(answer(0), show(call(SET_UPLINK_QOS, {512})));
    EXPECT_EQ(answer(0), show(call(SET_CAMERASIZE, {3})));
    EXPECT_EQ(answer(0), show(call(ENGINE_INIT, {0})));
    EXPECT_EQ(answer(0), show(call(RELEASE)));
    const V engine = logged(kEngineTag);
    ASSERT_GE(engine.size(), 8u);
    EXPECT_EQ((V{"I setUplinkQos, 512 kbitps", "I setCameraPreviewSize",
                 "I setCameraPreviewSize, update -1 -> 3", "I setCameraPreviewSize, camera is not open",
                 "I init, loopback? 0 E", "I init, loopback? 0 X", "I release"}),
              V(engine.begin(), engine.begin() + 7));
    EXPECT_EQ("I release X", engine.back());
    EXPECT_EQ((V{"I VCE_ACTION_SET_UPLINK_QOS", "I VCE_ACTION_SET_CAMERASIZE", "I VCE_ACTION_RELEASE"}),
              logged(kServiceTag));
}

TEST_F(ServiceTest, HideLocalImageReadsTheImageOnlyForHideOne) {
    const char* const image = "/sdcard/img.jpg";
    struct Case {
        int32_t hide;
        const char* text;
        const char* engineLine;
    };
    const Case cases[] = {
        {1, image, "I hideLocalImage, enable = 1, path = /sdcard/img.jpg"},
        // Hide values other than 1 mean "show", and a string after them is not read.
        {0, image, "I hideLocalImage, enable = 0, path = (null)"},
        {2, image, "I hideLocalImage, enable = 0, path = (null)"},
        {-1, nullptr, "I hideLocalImage, enable = 0, path = (null)"},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE("hide " + std::to_string(c.hide));
        mark();
        EXPECT_EQ(answer(0), show(call(HIDE_LOCAL_IMAGE, {c.hide}, nullptr, c.text)));
        EXPECT_EQ(V{"I VCE_ACTION_HIDE_LOCAL_IMAGE"}, logged(kServiceTag));
        EXPECT_EQ(V{c.engineLine}, logged(kEngineTag));
    }

    // Hide 1 without the image's name: nothing to send instead of the camera.
    mark();
    EXPECT_EQ(answer(BAD_VALUE), show(call(HIDE_LOCAL_IMAGE, {1})));
    EXPECT_EQ((V{"I VCE_ACTION_HIDE_LOCAL_IMAGE",
                 "E VCE_ACTION_HIDE_LOCAL_IMAGE, image path missing, refused"}),
              logged(kServiceTag));
    EXPECT_EQ(V{}, logged(kEngineTag));
    EXPECT_EQ(V{}, calls());
}

TEST_F(ServiceTest, SetSurfaceGivesTheProducerToTheTargetsRender) {
    sp<RemoteBinder> remote = enginetest::remoteProducer();
    sp<RemoteBinder> preview = enginetest::remoteProducer();

    mark();
    EXPECT_EQ(answer(0), show(call(SET_SURFACE, {REMOTE}, remote)));
    EXPECT_EQ(V{"I VCE_ACTION_SET_SURFACE, Remote"}, logged(kServiceTag));
    EXPECT_THAT(logged(kEngineTag), Contains("I setRemoteSurface add Render"));
    EXPECT_THAT(calls(), Contains("renderAdd(surface, \"Remote\") = 0"));
    EXPECT_EQ(V{"Remote"}, hostfakes::activeRenders());

    // The preview has no render until a camera is open; then it is shown at once.
    mark();
    EXPECT_EQ(answer(0), show(call(SET_SURFACE, {LOCAL}, preview)));
    EXPECT_EQ(V{"I VCE_ACTION_SET_SURFACE, Local"}, logged(kServiceTag));
    EXPECT_THAT(logged(kEngineTag), Contains("I setPreviewSurface add Render, camera is not opened"));
    EXPECT_THAT(calls(), Not(Contains(StartsWith("renderAdd"))));
    EXPECT_EQ(answer(0), show(call(SET_CAMERAID, {1})));
    EXPECT_THAT(calls(), Contains(std::string("renderAdd(surface, \"") + kFront + "\") = 0"));

    // Given again while the camera is open, the preview goes straight to the engine.
    mark();
    EXPECT_EQ(answer(0), show(call(SET_SURFACE, {LOCAL}, preview)));
    EXPECT_EQ(V{"I VCE_ACTION_SET_SURFACE, Local"}, logged(kServiceTag));
    EXPECT_EQ((V{"I setPreviewSurface", "I setPreviewSurface, local render is started"}),
              logged(kEngineTag));

    for (int32_t target : {2, 5, -1}) {
        SCOPED_TRACE("target " + std::to_string(target));
        mark();
        EXPECT_EQ(answer(0), show(call(SET_SURFACE, {target}, enginetest::remoteProducer())));
        EXPECT_EQ(V{}, logged(kServiceTag));
        EXPECT_EQ(V{}, logged(kEngineTag));
        EXPECT_EQ(V{}, calls());
    }
}

TEST_F(ServiceTest, SetSurfaceWithoutAProducerIsRefused) {
    sp<RemoteBinder> remote = enginetest::remoteProducer();
    startMedia(remote, enginetest::remoteProducer());
    for (int32_t target : std::initializer_list<int32_t>{REMOTE, LOCAL, 5}) {
        SCOPED_TRACE("target " + std::to_string(target));
        mark();
        EXPECT_EQ(answer(BAD_VALUE), show(call(SET_SURFACE, {target})));
        EXPECT_EQ(V{"E VCE_ACTION_SET_SURFACE, target " + std::to_string(target) +
                    ", producer is null, refused"},
                  logged(kServiceTag));
        EXPECT_EQ(V{}, logged(kEngineTag));
        EXPECT_EQ(V{}, calls());
    }
    EXPECT_EQ((V{kFront, "Remote"}), hostfakes::activeRenders());
}

TEST_F(ServiceTest, CleanSurfaceRemovesTheTargetsRender) {
    startMedia(enginetest::remoteProducer(), enginetest::remoteProducer());

    mark();
    EXPECT_EQ(answer(0), show(call(CLEAN_SURFACE, {REMOTE})));
    EXPECT_EQ(V{"I VCE_ACTION_CLEAN_SURFACE, Remote"}, logged(kServiceTag));
    ASSERT_TRUE(hostfakes::waitForRenderRemoves(1));
    EXPECT_EQ(V{kFront}, hostfakes::activeRenders());

    mark();
    EXPECT_EQ(answer(0), show(call(CLEAN_SURFACE, {LOCAL})));
    EXPECT_EQ(V{"I VCE_ACTION_CLEAN_SURFACE, Local"}, logged(kServiceTag));
    ASSERT_TRUE(hostfakes::waitForRenderRemoves(2));
    EXPECT_EQ(V{}, hostfakes::activeRenders());
    EXPECT_EQ(1u, hostfakes::openCameras().size());

    for (int32_t target : {2, -1}) {
        mark();
        EXPECT_EQ(answer(0), show(call(CLEAN_SURFACE, {target})));
        EXPECT_EQ(V{}, logged(kServiceTag));
        EXPECT_EQ(V{}, logged(kEngineTag));
    }
}

TEST_F(ServiceTest, TruncatedRequestsReadZerosAndNeverReadPastTheData) {
    // Missing fields read as 0 and a missing binder as null.
    const Parcel empty;
    struct Case {
        uint32_t code;
        V service;
        std::string engineLine;  // the engine's first line; empty: not reached
    };
    const Case cases[] = {
        {SET_SURFACE, {"E VCE_ACTION_SET_SURFACE, target 0, producer is null, refused"}, ""},
        {ENGINE_INIT, {}, "I init, loopback? 0 E"},
        {SET_CAMERASIZE, {"I VCE_ACTION_SET_CAMERASIZE"}, "I setCameraPreviewSize"},
        {DISPLAY_ORIENTATION, {"I VCE_ACTION_DISPLAY_ORIENTATION"},
         "I setDisplayOrientation, device: 0 -> 0, screen: 0 -> 0, auto_rotate: 1 -> 0"},
        {HIDE_LOCAL_IMAGE, {"I VCE_ACTION_HIDE_LOCAL_IMAGE"},
         "I hideLocalImage, enable = 0, path = (null)"},
        {SET_UPLINK_QOS, {"I VCE_ACTION_SET_UPLINK_QOS"}, "I setUplinkQos, ignore 0"},
        {SET_CAMERAID, {"I VCE_ACTION_SET_CAMERAID"}, "I setCameraId 0, open camera"},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE("code " + std::to_string(c.code));
        mark();
        const Reply r = call(c.code, empty);
        EXPECT_EQ(answer(c.code == SET_SURFACE ? BAD_VALUE : 0), show(r));
        EXPECT_EQ(c.service, logged(kServiceTag));
        const V engine = logged(kEngineTag);
        EXPECT_EQ(c.engineLine, engine.empty() ? "" : engine.front());
    }
    // Camera id 0 is a real camera: the empty request opened the back camera.
    EXPECT_THAT(calls(), Contains(StartsWith(std::string("camdrvOpen(\"") + kBack + "\", 0, ")));

    // Two bytes are not an int32: nothing of them is read as a value.
    const uint8_t twoBytes[] = {0x01, 0x00};
    Parcel shortRequest;
    shortRequest.setData(twoBytes, sizeof(twoBytes));
    ASSERT_EQ(2u, shortRequest.dataSize());
    const std::pair<uint32_t, const char*> shortCases[] = {
        {ENGINE_INIT, "I init, loopback? 0 E"},
        {HIDE_LOCAL_IMAGE, "I hideLocalImage, enable = 0, path = (null)"},
        {SET_UPLINK_QOS, "I setUplinkQos, ignore 0"},
    };
    for (const auto& c : shortCases) {
        SCOPED_TRACE("two bytes, code " + std::to_string(c.first));
        mark();
        EXPECT_EQ(answer(0), show(call(c.first, shortRequest)));
        ASSERT_FALSE(logged(kEngineTag).empty());
        EXPECT_EQ(c.second, logged(kEngineTag).front());
    }
    mark();
    EXPECT_EQ(answer(BAD_VALUE), show(call(SET_SURFACE, shortRequest)));
    EXPECT_EQ(V{"E VCE_ACTION_SET_SURFACE, target 0, producer is null, refused"}, logged(kServiceTag));
}

TEST_F(ServiceTest, EngineInitAndReleaseFrameACall) {
    mark();
    EXPECT_EQ(answer(0), show(call(ENGINE_INIT, {0})));
    EXPECT_EQ(V{}, logged(kServiceTag));
    EXPECT_EQ((V{"I init, loopback? 0 E", "I init, loopback? 0 X"}), logged(kEngineTag));

    startMedia(enginetest::remoteProducer(), enginetest::remoteProducer());
    const int handle = hostfakes::openCameras().at(0);

    mark();
    EXPECT_EQ(answer(0), show(call(RELEASE)));
    EXPECT_EQ(V{"I VCE_ACTION_RELEASE"}, logged(kServiceTag));
    const V engine = logged(kEngineTag);
    ASSERT_FALSE(engine.empty());
    EXPECT_EQ("I release", engine.front());
    EXPECT_EQ("I release X", engine.back());
    EXPECT_THAT(calls(), Contains("camdrvStop(" + std::to_string(handle) + ") = 0"));
    EXPECT_TRUE(rendersBecome({})) << hostfakes::activeRenders().size() << " renders left";
    EXPECT_TRUE(hostfakes::openCameras().empty());

    // A second release finds nothing left to end.
    mark();
    EXPECT_EQ(answer(0), show(call(RELEASE)));
    EXPECT_EQ((V{"I release", "I setRemoteSurface", "I setRemoteSurface null", "I setRemoteSurface X",
                 "I setPreviewSurface", "I setPreviewSurface null", "I setPreviewSurface X",
                 "I setCameraId -1, camera is closed", "I release X"}),
              logged(kEngineTag));
}

TEST_F(ServiceTest, AnotherServiceObjectGoingAwayLeavesTheEngineToTheRegisteredOne) {
    // A service object made and dropped at once, as a failed registration does.
    mark();
    { sp<VideoCallEngineService> transient = new VideoCallEngineService(); }
    EXPECT_EQ((V{"I create", "I destory"}), logged(kServiceTag));
    EXPECT_THAT(logged(kEngineTag), Not(Contains("I Destruct")));

    // A second registration replaces the first object under the same name.
    mark();
    EXPECT_EQ(NO_ERROR, VideoCallEngineService::instantiate());
    EXPECT_EQ((V{"I Instantiate", "I create", "I Instantiate, ret = 0"}), logged(kServiceTag));
    sp<IBinder> second = defaultServiceManager()->checkService(kServiceName);
    ASSERT_NE(nullptr, second);
    EXPECT_NE(binder, second);
    EXPECT_EQ(second, enginetest::service());

    // The first object goes with its last reference; the engine stays.
    mark();
    binder.clear();
    EXPECT_EQ(V{"I destory"}, logged(kServiceTag));
    EXPECT_EQ(V{}, logged(kEngineTag));
    EXPECT_THAT(calls(), Not(Contains("camdrvTerm() = 0")));

    // The registered object drives the engine, and the engine's events still arrive.
    sp<RemoteBinder> client = enginetest::remoteCallback();
    EXPECT_EQ(answer(0), show(call(SET_CALLBACK, {}, client)));
    EXPECT_EQ(answer(0), show(call(SET_CAMERAID, {1})));
    EXPECT_EQ(1u, hostfakes::openCameras().size());
    ASSERT_NE(nullptr, m_pMmeEventObserver.load());
    m_pMmeEventObserver.load()->mmeEvtUpdate(22);
    EXPECT_EQ(1u, client->transactionCount());
    client->kill();
    EXPECT_THAT(logged(kServiceTag), Contains("I binderDied, ims app died"));
    EXPECT_TRUE(hostfakes::openCameras().empty());
}

TEST_F(ServiceTest, TheLastServiceObjectGoingAwayDeletesTheEngineAndANewOneStartsAgain) {
    // Replacing the registration with an unrelated binder drops the only service object.
    mark();
    ASSERT_EQ(NO_ERROR, defaultServiceManager()->addService(kServiceName, new BBinder()));
    binder.clear();
    EXPECT_EQ(V{"I destory"}, logged(kServiceTag));
    EXPECT_THAT(logged(kEngineTag), Contains("I Destruct"));
    EXPECT_EQ((V{"camdrvTerm() = 0", "renderTerm() = 0", "Zmf_VideoSetListener(NULL) = 0",
                 "Zmf_OnTerminate() = 0"}),
              calls());
    // Nothing that delivers events still points at the deleted engine.
    EXPECT_EQ(nullptr, m_pMmeEventObserver.load());
    EXPECT_FALSE(hostfakes::zmfListenerRegistered());

    mark();
    EXPECT_EQ(NO_ERROR, VideoCallEngineService::instantiate());
    EXPECT_THAT(logged(kEngineTag), Contains("I Create new Instance"));
    EXPECT_EQ((V{"Zmf_OnIntialize() = 0", "Zmf_VideoSetListener(listener) = 0",
                 "camdrvInit(\"com.tessaroval.vce\", 24, \"system/lib64\") = 0", "renderInit() = 0"}),
              calls());
    sp<RemoteBinder> client = enginetest::remoteCallback();
    EXPECT_EQ(answer(0), show(call(SET_CALLBACK, {}, client)));
    ASSERT_NE(nullptr, m_pMmeEventObserver.load());
    m_pMmeEventObserver.load()->mmeEvtUpdate(23);
    EXPECT_EQ(1u, client->transactionCount());
}
