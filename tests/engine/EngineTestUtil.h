// What the engine suites share: a fixture that drives the engine through the
// registered service as the IMS client does, reads the platform call record
// from a mark, waits for the engine's detached render removals, and plays the
// modem on the engine's pipe; and, for the service and callback suites, a
// fixture that sees the engine start in a fresh process.
#ifndef QUELLBORN_TESTS_ENGINE_ENGINETESTUTIL_H
#define QUELLBORN_TESTS_ENGINE_ENGINETESTUTIL_H

#include <android/log.h>
#include <gtest/gtest.h>
#include <gui/Surface.h>

#include <algorithm>
#include <chrono>
#include <initializer_list>
#include <string>
#include <thread>
#include <vector>

#include "Eventually.h"
#include "EngineHarness.h"
#include "HostFakes.h"
#include "LogCapture.h"
#include "MmeEventObserver.h"
#include "VideoCallEngineImpl.h"
#include "VtspManager.h"
#include "VtspRecord.h"

namespace enginecase {

using Strings = std::vector<std::string>;

inline constexpr const char* kServiceTag = "VideoCallEngineService";
inline constexpr const char* kEngineTag = "VideoCallEngineImpl";
inline constexpr const char* kZmfTag = "VideoCallEngineZmf";
inline constexpr const char* kFront = "Camera 1, Facing front, Orientation 270";
inline constexpr const char* kBack = "Camera 0, Facing back, Orientation 90";
inline constexpr const char* kRemote = "Remote";
inline constexpr int kFirstHandle = 0x100;
// The video library's text for a remote picture of 640x480.
inline constexpr const char* kRemoteSize = R"({"Render":"Remote","SourceType":0,"Window":1,"Width":640,"Height":480})";

// Transaction codes of the service, as the client sends them.
inline constexpr uint32_t kInit = 0, kSetSurface = 1, kSetCallback = 2, kCleanCallback = 3, kEngineInit = 4,
                          kCleanSurface = 7, kRelease = 8, kCameraId = 9, kCameraSize = 10, kOrientation = 11,
                          kHideImage = 16, kUplinkQos = 17;
enum Target : int32_t { kRemoteView = 0, kLocalView = 1 };

inline std::string quoted(const std::string& text) { return "\"" + text + "\""; }

inline Strings plus(Strings calls, const Strings& more) {
    calls.insert(calls.end(), more.begin(), more.end());
    return calls;
}

// An event on the media engine's event path.
inline void mmeEvent(int event) {
    android::MmeEventObserver* observer = android::m_pMmeEventObserver.load();
    ASSERT_NE(nullptr, observer) << "no media engine observer";
    observer->mmeEvtUpdate(event);
}

inline bool contains(const std::vector<std::string>& all, const std::string& one) {
    return std::find(all.begin(), all.end(), one) != all.end();
}

// A command of the modem's for stream `streamId` of a call from 10.0.0.1:6000
// to 192.168.1.2:`remotePort`.
inline vtspcodec::StreamCommand streamCommand(int32_t code, uint32_t streamId,
                                              uint32_t dir = android::VTSP_STREAM_DIR_SENDRECV,
                                              uint16_t remotePort = 5000) {
    vtspcodec::StreamCommand c;
    c.code = code;
    c.streamId = streamId;
    c.dir = dir;
    c.localAddr = vtspcodec::address("10.0.0.1", 6000);
    c.remoteAddr = vtspcodec::address("192.168.1.2", remotePort);
    return c;
}
inline void modemSends(const vtspcodec::StreamCommand& c) {
    enginetest::modem().writeRecord(vtspcodec::streamRecord(c));
}

using enginetest::describe;
using enginetest::inOrder;
using enginetest::received;

class EngineCase : public ::testing::Test {
protected:
    void SetUp() override {
        ASSERT_NE(nullptr, enginetest::service());
        // Every case starts from a released engine in normal mode and sees
        // only its own lines and calls, also when several share a process.
        mRemovesBase = completedRemoves();
        send(kRelease);
        send(kEngineInit, {0});
        settleRemovals();
        hostfakes::setNextCameraHandle(kFirstHandle);
        hostfakes::setNextMvdStreamId(1);
        log.clear();
        mRemovesBase = completedRemoves();
        markCalls();
    }

    void TearDown() override {
        settleRemovals();
        for (const std::string& function : mOverrides) hostfakes::clearResult(function);
        hostfakes::setRenderRemoveDelayMs(0);
    }

    static android::VideoCallEngineImpl* engine() { return android::VideoCallEngineImpl::getInstance(); }
    static android::CmdCallbackMvd& dispatcher() { return *engine()->mVtspManager->mCmdCallback; }

    // Sends a request as the client does and returns the reply's integer.
    int32_t send(uint32_t code, std::initializer_list<int32_t> ints = {},
                 const android::sp<android::IBinder>& binder = nullptr, const char* text = nullptr) {
        const enginetest::Reply reply = enginetest::call(code, ints, binder, text);
        EXPECT_EQ(android::NO_ERROR, reply.status) << "code " << code;
        return reply.value;
    }
    int32_t setCamera(int32_t id) { return send(kCameraId, {id}); }
    void setSize(int32_t size) { send(kCameraSize, {size}); }
    void orient(int32_t device, int32_t screen, int32_t autoRotate) {
        send(kOrientation, {device, screen, autoRotate});
    }
    // Hands over a fresh producer of the client's process for a view.
    android::sp<hostbinder::RemoteBinder> setSurface(Target target) {
        android::sp<hostbinder::RemoteBinder> producer = enginetest::remoteProducer();
        EXPECT_EQ(0, send(kSetSurface, {target}, producer));
        return producer;
    }
    void cleanSurface(Target target) { send(kCleanSurface, {target}); }
    void hide(const char* path) { send(kHideImage, {1}, nullptr, path); }
    void show() { send(kHideImage, {0}); }
    android::sp<hostbinder::RemoteBinder> setCallback() {
        android::sp<hostbinder::RemoteBinder> client = enginetest::remoteCallback();
        send(kSetCallback, {}, client);
        return client;
    }

    // The call record from the last mark on. Removals still running would
    // land after the mark at random, so they are waited for first.
    void markCalls() {
        settleRemovals();
        mMark = hostfakes::callCount();
    }
    std::vector<std::string> newCalls() const { return hostfakes::callTextsSince(mMark); }
    std::vector<std::string> newCallsOf(const std::string& function) const {
        std::vector<std::string> out;
        for (const std::string& text : newCalls()) {
            if (text.compare(0, function.size() + 1, function + "(") == 0) out.push_back(text);
        }
        return out;
    }
    bool called(const std::string& text) const { return contains(newCalls(), text); }
    // The calls one step makes.
    template <typename Step>
    std::vector<std::string> callsOf(Step step) {
        markCalls();
        step();
        return newCalls();
    }

    // The engine's own info lines, in order.
    std::vector<std::string> engineLines() const {
        std::vector<std::string> out;
        for (const LogLine& line : log.linesWithTag(kEngineTag)) {
            if (line.priority == ANDROID_LOG_INFO) out.push_back(line.text);
        }
        return out;
    }
    std::vector<std::string> engineLinesSince(size_t from) const {
        std::vector<std::string> all = engineLines();
        return std::vector<std::string>(all.begin() + static_cast<std::ptrdiff_t>(std::min(from, all.size())),
                                        all.end());
    }
    bool logged(const std::string& text, int priority = ANDROID_LOG_INFO,
                const char* tag = kEngineTag) const {
        return log.contains(priority, tag, text);
    }

    // Waits until every render removal the engine started in this case has run.
    void settleRemovals() {
        EXPECT_TRUE(eventually([&] {
            return completedRemoves() >=
                   mRemovesBase + log.count(ANDROID_LOG_INFO, kEngineTag, "removeRender");
        })) << "render removals still pending";
    }

    // Makes a library function fail for the rest of the case.
    void failCalls(const std::string& function, int result) {
        hostfakes::setResult(function, result);
        mOverrides.push_back(function);
    }

    // Plays the modem: starts a send-and-receive stream and waits for its
    // bind request, which the link sends once the stream is configured.
    void startStream(uint32_t streamId) {
        modemSends(streamCommand(android::_VTSP_CMD_STREAM_VIDEO_START, streamId));
        android::VPR_Comm record{};  // the bind request's fields are the link's tests' concern
        ASSERT_TRUE(enginetest::modem().readRecord(&record)) << "no bind request";
        EXPECT_EQ(android::VPR_NET_CMD_BIND, vtspcodec::readBindRequest(record).code);
    }
    // Ends it; the engine stream `mvdStream` is then closed.
    void endStream(uint32_t streamId, unsigned int mvdStream) {
        const size_t from = hostfakes::callCount();
        modemSends(streamCommand(android::_VTSP_CMD_STREAM_VIDEO_END, streamId));
        const std::string closed = "Mvd_Close(" + std::to_string(mvdStream) + ") = 0";
        EXPECT_TRUE(eventually([&] { return contains(hostfakes::callTextsSince(from), closed); })) << closed;
    }

    LogCapture log;

private:
    static size_t completedRemoves() { return hostfakes::callCount("renderRemove"); }

    size_t mMark = 0;
    size_t mRemovesBase = 0;
    std::vector<std::string> mOverrides;
};

inline std::string openText(int id, int handle, int width, int height, int fps) {
    const bool front = id == 1;
    return "camdrvOpen(" + quoted(front ? kFront : kBack) + ", " + std::to_string(id) + ", " +
           (front ? "1, 270, " : "-1, 90, ") + std::to_string(width) + ", " + std::to_string(height) + ", " +
           std::to_string(fps) + ") = " + std::to_string(handle);
}
inline std::string renderAddText(const char* id, int result = 0) {
    return "renderAdd(surface, " + quoted(id) + ") = " + std::to_string(result);
}
inline std::string rotateText(const char* id, int angle) {
    return "renderRotate(" + quoted(id) + ", " + std::to_string(angle) + ") = 0";
}
inline std::string removeText(const char* id) { return "renderRemove(" + quoted(id) + ") = 0"; }

// The service and callback suites: each case (a process of its own) resets
// the call record before its first lookup registers the service, so it sees
// the engine's start-up.
class FreshServiceCase : public ::testing::Test {
protected:
    FreshServiceCase() {
        hostfakes::reset();
        service = enginetest::service();
    }
    // Lines of `tag`, each as "<I|E> <text>".
    Strings linesOf(const char* tag) const {
        Strings out;
        for (const LogLine& l : log.linesWithTag(tag)) {
            const char* p = l.priority == ANDROID_LOG_INFO ? "I " : l.priority == ANDROID_LOG_ERROR ? "E " : "? ";
            out.push_back(p + l.text);
        }
        return out;
    }
    size_t count(const char* tag, const std::string& text) const {
        return log.count(ANDROID_LOG_INFO, tag, text);
    }
    // Starts a fresh view of the log and of the platform calls.
    void mark() {
        log.clear();
        mStart = hostfakes::callCount();
    }
    Strings calls() const { return hostfakes::callTextsSince(mStart); }

    LogCapture log;
    android::sp<android::IBinder> service;

private:
    size_t mStart = 0;
};

}  // namespace enginecase

#endif  // QUELLBORN_TESTS_ENGINE_ENGINETESTUTIL_H
