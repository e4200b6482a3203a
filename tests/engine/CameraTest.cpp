// Camera control driven through the service: the capture size the uplink rate
// or the preview size calls for, opening, switching, resizing and closing
// captures, a failing camera driver, and the device and screen orientation.
#include "EngineTestUtil.h"

using namespace enginecase;

namespace {

class CameraTest : public EngineCase {
protected:
    // The dispatcher's choice, which every stream of the call follows.
    static int streamConfig() { return dispatcher().cameraConfig(); }
    Strings orientCalls(int device, int screen, int autoRotate) {
        return callsOf([&] { orient(device, screen, autoRotate); });
    }
};

}  // namespace

TEST_F(CameraTest, FirstOpenWithoutQosTakesVga30AndTheCameraAngleAndClosingUndoesIt) {
    EXPECT_EQ(0, setCamera(0));
    EXPECT_EQ((Strings{openText(0, kFirstHandle, 480, 640, 30), "camdrvOrientAngle(0) = 0"}), newCalls());
    EXPECT_EQ((Strings{"setCameraId 0, open camera", "startCapture, id: 0",
                       "getCameraSizeFromQos, no QOS seted", "startCapture, id: 0, camera size: 2"}),
              engineLines());
    EXPECT_EQ(2, streamConfig());
    EXPECT_STREQ(kBack, dispatcher().captureId());

    // Closing stops the capture and removes its preview, once.
    markCalls();
    EXPECT_EQ(0, setCamera(-1));
    EXPECT_EQ((Strings{"setCameraId -1, close camera", "removeRender", "stopCapture"}),
              engineLinesSince(4));  // after the open's four
    settleRemovals();
    // No preview render was added, yet the removal for the camera's name runs.
    Strings calls = newCalls();
    std::sort(calls.begin(), calls.end());
    EXPECT_EQ((Strings{"camdrvStop(256) = 0", removeText(kBack)}), calls);
    EXPECT_TRUE(callsOf([&] { EXPECT_EQ(0, setCamera(-1)); }).empty());
    EXPECT_EQ(1u, log.count(ANDROID_LOG_INFO, kEngineTag, "removeRender"));

    // Camera 1 is the front one; every other id is opened as the back camera.
    EXPECT_EQ((Strings{openText(1, kFirstHandle + 1, 480, 640, 30), "camdrvOrientAngle(0) = 0"}),
              callsOf([&] { EXPECT_EQ(0, setCamera(1)); }));
    EXPECT_STREQ(kFront, dispatcher().captureId());
    EXPECT_EQ(0, setCamera(-1));
    EXPECT_EQ(openText(5, kFirstHandle + 2, 480, 640, 30),
              callsOf([&] { EXPECT_EQ(0, setCamera(5)); }).at(0));
    // The size chosen at the first open holds until the next init.
    EXPECT_EQ(1u, log.count(ANDROID_LOG_INFO, kEngineTag, "getCameraSizeFromQos, no QOS seted"));
}

TEST_F(CameraTest, UplinkRateChoosesTheSizeOfTheNextOpen) {
    send(kUplinkQos, {0});
    send(kUplinkQos, {500});
    send(kUplinkQos, {500});
    EXPECT_EQ((Strings{"setUplinkQos, ignore 0", "setUplinkQos, 500 kbitps", "setUplinkQos, ignore 500"}),
              engineLines());

    // Each side of the two thresholds, and a rate below zero.
    const struct {
        int kbps, size, width, height, fps;
    } cases[] = {{479, 3, 240, 320, 15},
                 {480, 1, 480, 640, 15},
                 {895, 1, 480, 640, 15},
                 {896, 2, 480, 640, 30},
                 {-2, 3, 240, 320, 15}};
    int handle = kFirstHandle;
    for (const auto& c : cases) {
        SCOPED_TRACE(c.kbps);
        send(kEngineInit, {0});
        send(kUplinkQos, {c.kbps});
        EXPECT_EQ(openText(1, handle++, c.width, c.height, c.fps),
                  callsOf([&] { EXPECT_EQ(0, setCamera(1)); }).at(0));
        EXPECT_TRUE(logged("getCameraSizeFromQos, QOS:" + std::to_string(c.kbps * 1000) +
                           ", camerasize:" + std::to_string(c.size)));
        EXPECT_EQ(c.size, streamConfig());
        EXPECT_EQ(0, setCamera(-1));
    }

    // An open camera keeps its size whatever the rate does.
    send(kEngineInit, {0});
    send(kUplinkQos, {500});
    EXPECT_EQ(0, setCamera(0));
    EXPECT_TRUE(callsOf([&] { send(kUplinkQos, {900}); }).empty());
    EXPECT_EQ(1, streamConfig());
}

TEST_F(CameraTest, PreviewSizeIsFoldedToPortraitAndStoredWhileClosed) {
    setSize(8);
    EXPECT_EQ((Strings{"setCameraPreviewSize",
                       "setCameraPreviewSize always using reversed resolution for vga/qvga",
                       "setCameraPreviewSize, update -1 -> 2", "setCameraPreviewSize, camera is not open"}),
              engineLines());
    setSize(7);
    EXPECT_TRUE(logged("setCameraPreviewSize, update 2 -> 1"));
    setSize(6);
    EXPECT_TRUE(logged("setCameraPreviewSize, update 1 -> 6"));
    EXPECT_EQ(2u, log.count(ANDROID_LOG_INFO, kEngineTag,
                            "setCameraPreviewSize always using reversed resolution for vga/qvga"));
    const size_t lines = engineLines().size();
    setSize(6);
    EXPECT_EQ((Strings{"setCameraPreviewSize"}), engineLinesSince(lines));
    EXPECT_TRUE(newCalls().empty());

    // The stored size is the one the camera opens with; the rate is not asked.
    EXPECT_EQ(0, setCamera(0));
    EXPECT_EQ(openText(0, kFirstHandle, 176, 144, 30), newCalls().at(0));
    EXPECT_FALSE(logged("getCameraSizeFromQos, no QOS seted"));
    EXPECT_EQ(6, streamConfig());
}

TEST_F(CameraTest, SizeChangeResizesTheOpenCapture) {
    EXPECT_EQ(0, setCamera(1));
    EXPECT_EQ((Strings{"camdrvResize(256, 240, 320, 15) = 0"}), callsOf([&] { setSize(3); }));
    EXPECT_TRUE(
            inOrder(engineLines(), {"setCameraPreviewSize, update 2 -> 3", "restartCapture, new_size:3"}));
    EXPECT_EQ(3, streamConfig());
    // 9 folds to 3, the size already in use: nothing happens.
    EXPECT_TRUE(callsOf([&] { setSize(9); }).empty());
    EXPECT_EQ((Strings{"camdrvResize(256, 480, 640, 30) = 0"}), callsOf([&] { setSize(2); }));
    EXPECT_EQ(2, streamConfig());
}

TEST_F(CameraTest, FailedOpenAnswersMinusOneAndLeavesTheCameraClosed) {
    const char* capture = dispatcher().captureId();
    failCalls("camdrvOpen", 0);
    EXPECT_EQ(-1, setCamera(0));
    EXPECT_TRUE(logged("setCameraId, startCapture failed"));
    EXPECT_EQ((Strings{openText(0, 0, 480, 640, 30)}), newCalls());
    EXPECT_EQ(capture, dispatcher().captureId());

    markCalls();
    EXPECT_EQ(0, setCamera(-1));
    EXPECT_TRUE(logged("setCameraId -1, camera is closed"));
    orient(90, 0, 1);
    EXPECT_TRUE(newCallsOf("camdrvOrientAngle").empty());

    hostfakes::clearResult("camdrvOpen");
    EXPECT_EQ(0, setCamera(0));
    EXPECT_TRUE(called(openText(0, kFirstHandle, 480, 640, 30)));
    EXPECT_TRUE(called("camdrvOrientAngle(270) = 0"));
}

TEST_F(CameraTest, OrientationRotatesCaptureAndRendersAlsoAtTheExtremes) {
    EXPECT_EQ(0, setCamera(0));
    setSurface(kLocalView);
    setSurface(kRemoteView);

    // Without auto-rotate the screen counts as upright.
    EXPECT_EQ((Strings{"camdrvOrientAngle(270) = 0", rotateText(kBack, 270), rotateText(kRemote, 270)}),
              orientCalls(90, 1, 0));
    EXPECT_EQ((Strings{"setDisplayOrientation, device: 0 -> 90, screen: 0 -> 1, auto_rotate: 1 -> 0",
                       "setDisplayOrientation, enforce screen orientation to be 0"}),
              engineLinesSince(engineLines().size() - 2));
    // Auto-rotate back on: the remote rotation is worked out again, here 0.
    EXPECT_EQ((Strings{"camdrvOrientAngle(0) = 0", rotateText(kBack, 0), rotateText(kRemote, 0)}),
              orientCalls(0, 0, 1));
    // With auto-rotate staying on, an upright remote render stays upright
    // while the preview turns: (720 - 90 - 270) mod 360 = 0.
    EXPECT_EQ((Strings{"camdrvOrientAngle(270) = 0", rotateText(kBack, 0)}), orientCalls(90, 3, 1));
    EXPECT_EQ(1u, log.count(ANDROID_LOG_INFO, kEngineTag,
                            "setDisplayOrientation, enforce screen orientation to be 0"));
    EXPECT_EQ((Strings{"camdrvOrientAngle(0) = 0", rotateText(kBack, 270)}), orientCalls(0, 1, 1));
    // Extreme angles give the truncated remainders without overflow:
    // (360 + 2^31) mod 360 = 128; (720 + 2^31 - 90 * (2^31 - 1)) mod 360 = -142.
    EXPECT_EQ((Strings{"camdrvOrientAngle(128) = 0", rotateText(kBack, -142), rotateText(kRemote, -142)}),
              orientCalls(INT32_MIN, INT32_MAX, 2));
    EXPECT_EQ((Strings{"camdrvOrientAngle(-127) = 0", rotateText(kBack, 233), rotateText(kRemote, 233)}),
              orientCalls(INT32_MAX, INT32_MIN, 3));

    // A closed camera and no preview: only the remote render follows.
    EXPECT_EQ(0, setCamera(-1));
    EXPECT_EQ((Strings{rotateText(kRemote, 180)}), orientCalls(180, 0, 0));
    // Switching auto-rotate on works the remote rotation out again even when
    // the remote view is upright.
    orient(0, 0, 0);
    EXPECT_EQ((Strings{rotateText(kRemote, 270)}), orientCalls(90, 0, 1));
    // The device angle set while closed is the capture's at the next open.
    EXPECT_EQ(0, setCamera(1));
    EXPECT_TRUE(called("camdrvOrientAngle(270) = 0"));
}

TEST_F(CameraTest, SwitchingCamerasClosesTheOpenOneFirst) {
    EXPECT_EQ(0, setCamera(1));
    setSurface(kLocalView);
    markCalls();
    const size_t lines = engineLines().size();
    EXPECT_EQ(0, setCamera(0));
    settleRemovals();
    EXPECT_TRUE(
            inOrder(newCalls(), {"camdrvStop(256) = 0", openText(0, kFirstHandle + 1, 480, 640, 30),
                                 "camdrvOrientAngle(0) = 0", renderAddText(kBack), rotateText(kBack, 0)}));
    EXPECT_TRUE(called(removeText(kFront)));
    // The stored preview surface follows the switch under the new camera's name.
    EXPECT_EQ((Strings{kBack}), hostfakes::activeRenders());
    EXPECT_TRUE(inOrder(engineLinesSince(lines),
                        {"setCameraId -1, close camera", "removeRender", "stopCapture",
                         "setCameraId 0, open camera", "setCameraId, id: 0, start local render"}));
    EXPECT_STREQ(kBack, dispatcher().captureId());
}

TEST_F(CameraTest, OpeningWithAStoredPreviewSurfaceShowsThePreview) {
    setSurface(kLocalView);
    EXPECT_TRUE(newCalls().empty());
    orient(0, 1, 1);
    EXPECT_EQ((Strings{openText(1, kFirstHandle, 480, 640, 30), "camdrvOrientAngle(0) = 0",
                       renderAddText(kFront), rotateText(kFront, 270)}),
              callsOf([&] { EXPECT_EQ(0, setCamera(1)); }));
    EXPECT_TRUE(logged("setCameraId, id: 1, start local render"));
    EXPECT_EQ(1u, android::Surface::liveCount());
    setSurface(kLocalView);
    EXPECT_TRUE(logged("setPreviewSurface, local render is started"));

    // A render the library refuses at the open is retried by the next surface.
    EXPECT_EQ(0, setCamera(-1));
    failCalls("renderAdd", -1);
    EXPECT_EQ(0, setCamera(0));
    EXPECT_TRUE(logged("setCameraId, addRender failed", ANDROID_LOG_ERROR));
    hostfakes::clearResult("renderAdd");
    EXPECT_EQ((Strings{renderAddText(kBack), rotateText(kBack, 270)}),
              callsOf([&] { setSurface(kLocalView); }));
}
