// The remote view and the local preview as the client hands them over:
// adding each render once, rotating it as it appears, refusals by the render
// library, removals that nobody waits for (and that never take away a render
// added again), the surfaces' lifetime, and the still image that replaces
// the camera picture on the call's streams.
#include "EngineTestUtil.h"

using namespace enginecase;
using Strings = std::vector<std::string>;

namespace {

constexpr const char* kImage = "/data/vce/hold.png";

class RenderTest : public EngineCase {
protected:
    static android::sp<android::IBinder> binderOf(const android::sp<android::IGraphicBufferProducer>& p) {
        return android::IInterface::asBinder(p);
    }
};

}  // namespace

TEST_F(RenderTest, RemoteRenderIsAddedOnceAndKeepsItsFirstSurface) {
    setSurface(kRemoteView);
    const android::sp<hostbinder::RemoteBinder> second = setSurface(kRemoteView);
    EXPECT_EQ((Strings{renderAddText(kRemote), rotateText(kRemote, 0)}), newCalls());
    EXPECT_EQ((Strings{"setRemoteSurface", "setRemoteSurface add Render", "setRemoteSurface X",
                       "setRemoteSurface", "setRemoteSurface, remote render is started"}),
              engineLines());
    // Only the producer is replaced; the render draws into the first surface.
    EXPECT_EQ(android::sp<android::IBinder>(second), binderOf(engine()->mRemoteSurface));
    EXPECT_EQ(1u, android::Surface::liveCount());
    EXPECT_EQ((Strings{kRemote}), hostfakes::activeRenders());

    const size_t lines = engineLines().size();
    cleanSurface(kRemoteView);
    EXPECT_EQ((Strings{"setRemoteSurface", "setRemoteSurface null", "removeRender", "setRemoteSurface X"}),
              engineLinesSince(lines));
    settleRemovals();
    EXPECT_TRUE(called(removeText(kRemote)));
    EXPECT_TRUE(hostfakes::activeRenders().empty());
    EXPECT_EQ(0u, android::Surface::liveCount());
    EXPECT_EQ(nullptr, engine()->mRemoteSurface);
}

TEST_F(RenderTest, ClearingViewsThatWereNeverShownOnlyLogs) {
    cleanSurface(kRemoteView);
    cleanSurface(kLocalView);
    EXPECT_EQ((Strings{"setRemoteSurface", "setRemoteSurface null", "setRemoteSurface X", "setPreviewSurface",
                       "setPreviewSurface null", "setPreviewSurface X"}),
              engineLines());
    EXPECT_TRUE(logged("VCE_ACTION_CLEAN_SURFACE, Remote", ANDROID_LOG_INFO, "VideoCallEngineService"));
    EXPECT_TRUE(newCalls().empty());
    EXPECT_EQ(0u, android::Surface::liveCount());
}

TEST_F(RenderTest, NewRendersStartWithTheCurrentRotation) {
    // Device at 90 degrees without auto-rotate: the remote picture turns to 270.
    orient(90, 0, 0);
    markCalls();
    setSurface(kRemoteView);
    EXPECT_EQ((Strings{renderAddText(kRemote), rotateText(kRemote, 270)}), newCalls());

    // The preview carries the open camera's name and the display angle.
    send(kRelease);
    EXPECT_EQ(0, setCamera(1));
    markCalls();
    setSurface(kLocalView);
    EXPECT_EQ((Strings{renderAddText(kFront), rotateText(kFront, 0)}), newCalls());
    EXPECT_TRUE(inOrder(engineLines(),
                        {"setPreviewSurface", "setPreviewSurface add Render", "setPreviewSurface X"}));

    orient(0, 1, 1);
    cleanSurface(kLocalView);
    settleRemovals();
    markCalls();
    setSurface(kLocalView);
    EXPECT_EQ((Strings{renderAddText(kFront), rotateText(kFront, 270)}), newCalls());
}

TEST_F(RenderTest, PreviewWithoutCameraIsOnlyStored) {
    const android::sp<hostbinder::RemoteBinder> producer = setSurface(kLocalView);
    EXPECT_EQ((Strings{"setPreviewSurface", "setPreviewSurface add Render, camera is not opened"}),
              engineLines());
    EXPECT_TRUE(newCalls().empty());
    EXPECT_TRUE(hostfakes::activeRenders().empty());
    EXPECT_EQ(0u, android::Surface::liveCount());
    EXPECT_EQ(android::sp<android::IBinder>(producer), binderOf(engine()->mPreviewSurface));

    // init forgets the stored producer: a camera opened afterwards shows nothing.
    send(kEngineInit, {0});
    EXPECT_EQ(nullptr, engine()->mPreviewSurface);
    EXPECT_EQ(0, setCamera(0));
    EXPECT_TRUE(newCallsOf("renderAdd").empty());
}

TEST_F(RenderTest, RefusedRenderIsLoggedAndTriedAgainNextTime) {
    failCalls("renderAdd", -1);
    setSurface(kRemoteView);
    EXPECT_EQ((Strings{renderAddText(kRemote, -1)}), newCalls());
    EXPECT_TRUE(logged("setRemoteSurface, addRender failed", ANDROID_LOG_ERROR));
    EXPECT_TRUE(logged("setRemoteSurface X"));
    // The library took the surface over and dropped it.
    EXPECT_EQ(0u, android::Surface::liveCount());

    EXPECT_EQ(0, setCamera(1));
    markCalls();
    setSurface(kLocalView);
    EXPECT_EQ((Strings{renderAddText(kFront, -1)}), newCalls());
    EXPECT_TRUE(logged("setPreviewSurface, addRender failed", ANDROID_LOG_ERROR));

    hostfakes::clearResult("renderAdd");
    markCalls();
    setSurface(kRemoteView);
    setSurface(kLocalView);
    EXPECT_EQ((Strings{renderAddText(kRemote), rotateText(kRemote, 0), renderAddText(kFront),
                       rotateText(kFront, 0)}),
              newCalls());
    EXPECT_FALSE(logged("setRemoteSurface, remote render is started"));
    EXPECT_EQ(2u, android::Surface::liveCount());
}

TEST_F(RenderTest, RemovalDoesNotHoldUpTheClient) {
    setSurface(kRemoteView);
    hostfakes::setRenderRemoveDelayMs(500);
    const auto before = std::chrono::steady_clock::now();
    cleanSurface(kRemoteView);
    const auto took = std::chrono::steady_clock::now() - before;
    // Answered while the render library is still tearing the render down.
    EXPECT_EQ((Strings{kRemote}), hostfakes::activeRenders());
    EXPECT_FALSE(called(removeText(kRemote)));
    EXPECT_LT(took, std::chrono::milliseconds(400));
    settleRemovals();
    EXPECT_TRUE(hostfakes::activeRenders().empty());
    EXPECT_EQ(0u, android::Surface::liveCount());
}

TEST_F(RenderTest, PendingRemovalNeverTakesAwayARenderAddedAgain) {
    hostfakes::setRenderRemoveDelayMs(300);
    setSurface(kRemoteView);
    cleanSurface(kRemoteView);
    setSurface(kRemoteView);
    settleRemovals();
    EXPECT_TRUE(inOrder(newCalls(), {renderAddText(kRemote), removeText(kRemote), renderAddText(kRemote)}));
    EXPECT_EQ((Strings{kRemote}), hostfakes::activeRenders());
    EXPECT_EQ(1u, android::Surface::liveCount());

    // The same for the preview when its camera closes and opens again.
    setSurface(kLocalView);
    EXPECT_EQ(0, setCamera(1));
    EXPECT_EQ(0, setCamera(-1));
    EXPECT_EQ(0, setCamera(1));
    settleRemovals();
    EXPECT_EQ((Strings{kFront, kRemote}), hostfakes::activeRenders());
    EXPECT_EQ(2u, android::Surface::liveCount());

    // Releasing takes both away for good, and every surface is let go.
    send(kRelease);
    settleRemovals();
    EXPECT_TRUE(hostfakes::activeRenders().empty());
    EXPECT_EQ(0u, android::Surface::liveCount());
}

TEST_F(RenderTest, HiddenImageGoesToTheStreamsOfTheCall) {
    hide(kImage);
    show();
    EXPECT_EQ((Strings{std::string("hideLocalImage, enable = 1, path = ") + kImage,
                       "hideLocalImage, enable = 0, path = (null)"}),
              engineLines());
    EXPECT_TRUE(newCalls().empty());

    ASSERT_NO_FATAL_FAILURE(startStream(3));
    markCalls();
    hide(kImage);
    EXPECT_EQ((Strings{"Mvd_FileStartSendImage(1, " + quoted(kImage) + ") = 0"}), newCalls());
    markCalls();
    show();
    EXPECT_EQ((Strings{"Mvd_FileStopSendImage(1) = 0"}), newCalls());
    endStream(3, 1);
}
