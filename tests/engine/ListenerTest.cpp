// The video library's events as its listener thread delivers them: which
// events are scanned and with which template, what reaches the engine and the
// client, malformed and oversized texts, and starting and stopping the
// library.
#include "EngineTestUtil.h"
#include "ZmfEventObserver.h"

using namespace enginecase;

namespace {

std::string renderJson(const std::string& id, int source, const std::string& width,
                       const std::string& height) {
    return R"({"Render":")" + id + R"(","SourceType":)" + std::to_string(source) +
           R"(,"Window":4660,"Width":)" + width + R"(,"Height":)" + height + "}";
}
std::string remoteSize(int source, int width, int height) {
    return renderJson(kRemote, source, std::to_string(width), std::to_string(height));
}
std::string captureJson(const std::string& id, int width, int height, int fps) {
    return R"({"Capture":")" + id + R"(","Width":)" + std::to_string(width) + R"(,"Height":)" +
           std::to_string(height) + R"(,"FrameRate":)" + std::to_string(fps) + "}";
}
// A text as the call record quotes it.
std::string recorded(const std::string& text) {
    std::string out = "\"";
    for (char c : text) {
        if (c == '"' || c == '\\') out += '\\';
        out += c;
    }
    return out + "\"";
}
std::string listenLine(int event, const std::string& json) {
    return "listen, Evt:ZmfEvent" + std::to_string(event) + "=" + json;
}

class ListenerTest : public EngineCase {
protected:
    // Delivers an event on this thread, as the library's event thread would.
    static void fire(int event, const std::string& json) {
        ASSERT_TRUE(hostfakes::fireZmfEvent(event, json.c_str())) << "no listener registered";
    }
    size_t scanFailures() const { return log.count(ANDROID_LOG_ERROR, kZmfTag, "scanf json failed"); }
    Strings zmfLines() const {
        Strings out;
        for (const LogLine& line : log.linesWithTag(kZmfTag)) out.push_back(line.text);
        return out;
    }
};

}  // namespace

TEST_F(ListenerTest, RenderAndCaptureEventsReachTheEngineAndOnlyTheRemoteSizeTheClient) {
    fire(27, remoteSize(0, 640, 480));
    EXPECT_EQ((Strings{listenLine(27, remoteSize(0, 640, 480))}), zmfLines());
    EXPECT_EQ((Strings{"zmfRenderEvtUpdate, evt:28 [Remote], type 0, [640x480]", "notifyCallback null"}),
              engineLines());

    // Other render events, other sources and capture events stay in the engine.
    const android::sp<hostbinder::RemoteBinder> client = setCallback();
    const size_t lines = engineLines().size();
    fire(26, remoteSize(0, 640, 480));
    fire(28, remoteSize(1, 640, 480));
    fire(27, renderJson(kFront, 2, "480", "640"));
    fire(30, captureJson(kFront, 480, 640, 30));
    fire(20, captureJson(kBack, 240, 320, 15));
    EXPECT_EQ((Strings{"zmfRenderEvtUpdate, evt:26 [Remote], type 0, [640x480]",
                       "zmfRenderEvtUpdate, evt:28 [Remote], type 1, [640x480]",
                       std::string("zmfRenderEvtUpdate, evt:28 [") + kFront + "], type 2, [480x640]",
                       std::string("zmfCaptureEvtUpdate, evt:30 [") + kFront + "], [480x640], fps:30",
                       std::string("zmfCaptureEvtUpdate, evt:20 [") + kBack + "], [240x320], fps:15"}),
              engineLinesSince(lines));
    fire(27, remoteSize(0, 640, 480));
    fire(28, remoteSize(0, 1280, 720));
    EXPECT_EQ((Strings{"code 1 flags 0: 11 640 480 0", "code 1 flags 0: 11 1280 720 0"}), received(*client));
}

// Some events are scanned and dropped; the rest (outside 20 to 30, or
// without a text of their own) are only logged.
TEST_F(ListenerTest, EventsTheEngineTakesNoPartInGoNoFurther) {
    const std::string json = remoteSize(0, 640, 480);
    const struct {
        int event;
        std::string json;
        const char* templ;  // null: not scanned
        int count;
    } cases[] = {
            {21, R"({"Capture":"Camera 1"})", R"({"Capture":"%s"})", 1},
            {22, R"({"Capture":"Camera 1","Face":2,"Width":480,"Height":640})",
             R"({"Capture":"%s","Face":%d,"Width":%d,"Height":%d})", 4},
            {25, R"({"Render":"Remote","SourceType":0,"Width":640,"Height":480})",
             R"({"Render":"%s","SourceType":%d,"Width":%d,"Height":%d})", 4},
            {29, R"({"Render":"Remote","SourceType":0,"Window":4660})",
             R"({"Render":"%s","SourceType":%d,"Window":%ld})", 3},
            {19, json, nullptr, 0},
            {31, json, nullptr, 0},
            {23, json, nullptr, 0},
            {24, json, nullptr, 0},
            {0, json, nullptr, 0},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.event);
        log.clear();
        const Strings calls = callsOf([&] { fire(c.event, c.json); });
        EXPECT_EQ(c.templ == nullptr ? Strings{}
                                     : Strings{"Zmf_ScanfJson(" + recorded(c.json) + ", " +
                                               recorded(c.templ) + ") = " + std::to_string(c.count)},
                  calls);
        EXPECT_EQ((Strings{listenLine(c.event, c.json)}), zmfLines());  // and no scan failure
        EXPECT_TRUE(engineLines().empty());
    }
}

TEST_F(ListenerTest, MalformedOrOversizedTextIsRejected) {
    const android::sp<hostbinder::RemoteBinder> client = setCallback();
    const size_t lines = engineLines().size();
    const struct {
        int event;
        std::string json;
    } cases[] = {
            {20, R"({"Capture":"Camera 1","Width":480,"Height":640})"},
            {30, R"({"Capture":"Camera 1","Width":480,"Height":640,"FrameRate":})"},
            {27, R"({"Render":Remote,"SourceType":0,"Window":4660,"Width":640,"Height":480})"},
            {27, renderJson(kRemote, 0, "wide", "480")},
            {27, renderJson(kRemote, 0, "2147483648", "480")},
            {27, ""},
            {27, R"({"Render":"Remote","SourceType":0,"Win)"},
            {26, R"({"Render":"Remote","SourceType":0,"Width":640,"Height":480})"},
            // One byte more than the library's texts hold with a terminator, and far more.
            {27, renderJson(std::string(512, 'r'), 0, "640", "480")},
            {30, captureJson(std::string(8192, 'c'), 480, 640, 30)},
    };
    size_t failures = 0;
    for (const auto& c : cases) {
        SCOPED_TRACE(c.json.substr(0, 80));
        fire(c.event, c.json);
        EXPECT_EQ(++failures, scanFailures());
    }
    ASSERT_TRUE(hostfakes::fireZmfEvent(27, nullptr));
    EXPECT_TRUE(logged("listen, Evt:ZmfEvent27=(null)", ANDROID_LOG_INFO, kZmfTag));
    EXPECT_EQ(++failures, scanFailures());
    EXPECT_TRUE(engineLinesSince(lines).empty());
    EXPECT_EQ(0u, client->transactionCount());

    // The longest id that fits goes through whole.
    const std::string longest(511, 'r');
    fire(27, renderJson(longest, 0, "640", "480"));
    EXPECT_EQ(failures, scanFailures());
    EXPECT_TRUE(logged("zmfRenderEvtUpdate, evt:28 [" + longest + "], type 0, [640x480]"));
    EXPECT_EQ(1u, client->transactionCount());
}

TEST_F(ListenerTest, LibraryIsStoppedOnceAndCanBeStartedAgain) {
    EXPECT_EQ(1, _zmf);
    EXPECT_EQ((Strings{"Zmf_VideoSetListener(NULL) = 0", "Zmf_OnTerminate() = 0"}),
              callsOf([] { EXPECT_EQ(0, android::zmfTerminate()); }));
    EXPECT_EQ(0, _zmf);

    EXPECT_TRUE(callsOf([] { EXPECT_EQ(0, android::zmfTerminate()); }).empty());
    EXPECT_EQ((Strings{"zmfTerminate", "zmfTerminate"}), zmfLines());

    // Started anew; the engine stayed the observer throughout.
    EXPECT_EQ((Strings{"Zmf_OnIntialize() = 0", "Zmf_VideoSetListener(listener) = 0"}),
              callsOf([] { android::zmfInitialize(); }));
    EXPECT_EQ(1, _zmf);
    fire(28, remoteSize(0, 320, 240));
    EXPECT_TRUE(logged("zmfRenderEvtUpdate, evt:28 [Remote], type 0, [320x240]"));

    // A second load leaves the running library alone but registers again.
    EXPECT_EQ((Strings{"camdrvInit(\"com.tessaroval.vce\", 24, \"system/lib64\") = 0", "renderInit() = 0"}),
              callsOf([&] { EXPECT_EQ(0, engine()->loadZmf(24, "com.tessaroval.vce")); }));
    EXPECT_EQ(1, _zmf);

    // Without an observer the events are dropped without a word.
    android::registerZmfEventObserver(nullptr);
    const size_t lines = engineLines().size();
    fire(30, captureJson(kFront, 480, 640, 30));
    EXPECT_EQ(lines, engineLines().size());
    EXPECT_EQ(0u, scanFailures());
    android::registerZmfEventObserver(engine());
}
