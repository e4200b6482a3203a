// The engine as observer of the video library's capture and render events.
#include <android/log.h>

#include "VideoCallEngineImpl.h"

namespace android {

namespace {

constexpr const char* kTag = "VideoCallEngineImpl";

// Render events that carry the render's size, and the source type of the
// render that shows the remote party.
constexpr int kRenderSizeEventA = 27;
constexpr int kRenderSizeEvent = 28;
constexpr int kSourceRemote = 0;

const char* text(const char* s) { return s != nullptr ? s : "(null)"; }

}  // namespace

void VideoCallEngineImpl::zmfRenderEvtUpdate(int event, const char* renderId, int sourceType,
                                             int width, int height) {
    __android_log_print(ANDROID_LOG_INFO, kTag, "%s, evt:%d [%s], type %d, [%dx%d]",
                        "zmfRenderEvtUpdate", event, text(renderId), sourceType, width, height);
    if ((event == kRenderSizeEventA || event == kRenderSizeEvent) && sourceType == kSourceRemote) {
        notifyCallback(VCE_EVENT_REMOTE_VIDEO_SIZE, width, height, 0);
    }
}

void VideoCallEngineImpl::zmfCaptureEvtUpdate(int event, const char* captureId, int width,
                                              int height, int frameRate) {
    __android_log_print(ANDROID_LOG_INFO, kTag, "%s, evt:%d [%s], [%dx%d], fps:%d",
                        "zmfCaptureEvtUpdate", event, text(captureId), width, height, frameRate);
}

}  // namespace android
