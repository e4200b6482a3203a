// The remote view and the local preview as the client hands them over:
// adding each render once, rotating it as it appears, refusals by the render
// library, removals that nobody waits for (and that never take away a render
// added again), and the surfaces' lifetime.
#include "EngineTestUtil.h"

using namespace enginecase;

namespace {

class RenderTest : public EngineCase {};

}  // namespace

TEST_F(RenderTest, RemoteRenderIsAddedOnceAndKeepsItsFirstSurface) {
    setSurface(kRemoteView);
    const android::sp<hostbinder::RemoteBinder> second = setSurface(kRemoteView);
    EXPECT_EQ((Strings{renderAddText(kRemote), rotateText(kRemote, 0)}), newCalls());
    EXPECT_EQ((Strings{"setRemoteSurface", "setRemoteSurface add Render", "setRemoteSurface X",
                       "setRemoteSurface", "setRemoteSurface, remote render is started"}),
              engineLines());
    // Only the producer is replaced; the render draws into the first surface.
    EXPECT_EQ(android::sp<android::IBinder>(second), android::IInterface::asBinder(engine()->mRemoteSurface));
    EXPECT_EQ(1u, android::Surface::liveCount());

    const size_t lines = engineLines().size();
    cleanSurface(kRemoteView);
    EXPECT_EQ((Strings{"setRemoteSurface", "setRemoteSurface null", "removeRender", "setRemoteSurface X"}),
              engineLinesSince(lines));
    settleRemovals();
    EXPECT_TRUE(called(removeText(kRemote)));
    EXPECT_EQ(0u, android::Surface::liveCount());
    EXPECT_EQ(nullptr, engine()->mRemoteSurface);
}

TEST_F(RenderTest, NewRendersStartWithTheCurrentRotation) {
    // Device at 90 degrees without auto-rotate: the remote picture turns to 270.
    orient(90, 0, 0);
    EXPECT_EQ((Strings{renderAddText(kRemote), rotateText(kRemote, 270)}),
              callsOf([&] { setSurface(kRemoteView); }));

    // The preview carries the open camera's name and the display angle.
    send(kRelease);
    EXPECT_EQ(0, setCamera(1));
    EXPECT_EQ((Strings{renderAddText(kFront), rotateText(kFront, 0)}),
              callsOf([&] { setSurface(kLocalView); }));
    EXPECT_TRUE(inOrder(engineLines(),
                        {"setPreviewSurface", "setPreviewSurface add Render", "setPreviewSurface X"}));

    // Cleared, the preview goes; the camera stays open. Shown again, it takes the new angle.
    orient(0, 1, 1);
    cleanSurface(kLocalView);
    settleRemovals();
    EXPECT_TRUE(hostfakes::activeRenders().empty());
    EXPECT_EQ(1u, hostfakes::openCameras().size());
    EXPECT_EQ((Strings{renderAddText(kFront), rotateText(kFront, 270)}),
              callsOf([&] { setSurface(kLocalView); }));
}

TEST_F(RenderTest, ViewsNeverShownOnlyLogAndAPreviewWithoutCameraIsOnlyStored) {
    cleanSurface(kRemoteView);
    cleanSurface(kLocalView);
    const android::sp<hostbinder::RemoteBinder> producer = setSurface(kLocalView);
    EXPECT_EQ((Strings{"setRemoteSurface", "setRemoteSurface null", "setRemoteSurface X", "setPreviewSurface",
                       "setPreviewSurface null", "setPreviewSurface X", "setPreviewSurface",
                       "setPreviewSurface add Render, camera is not opened"}),
              engineLines());
    EXPECT_TRUE(newCalls().empty());
    EXPECT_EQ(0u, android::Surface::liveCount());
    EXPECT_EQ(android::sp<android::IBinder>(producer),
              android::IInterface::asBinder(engine()->mPreviewSurface));

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
    // The library took the surface over and dropped it.
    EXPECT_EQ(0u, android::Surface::liveCount());

    EXPECT_EQ(0, setCamera(1));
    EXPECT_EQ((Strings{renderAddText(kFront, -1)}), callsOf([&] { setSurface(kLocalView); }));
    EXPECT_TRUE(logged("setPreviewSurface, addRender failed", ANDROID_LOG_ERROR));

    hostfakes::clearResult("renderAdd");
    EXPECT_EQ((Strings{renderAddText(kRemote), rotateText(kRemote, 0), renderAddText(kFront),
                       rotateText(kFront, 0)}),
              callsOf([&] {
                  setSurface(kRemoteView);
                  setSurface(kLocalView);
              }));
    EXPECT_EQ(2u, android::Surface::liveCount());
}

TEST_F(RenderTest, RemovalDoesNotHoldUpTheClientNorTakeAwayARenderAddedAgain) {
    hostfakes::setRenderRemoveDelayMs(500);
    setSurface(kRemoteView);
    const auto before = std::chrono::steady_clock::now();
    cleanSurface(kRemoteView);
    // Answered while the render library is still tearing the render down.
    EXPECT_LT(std::chrono::steady_clock::now() - before, std::chrono::milliseconds(400));
    EXPECT_EQ((Strings{kRemote}), hostfakes::activeRenders());
    EXPECT_FALSE(called(removeText(kRemote)));
    // Added again meanwhile: the add waits for the removal.
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
