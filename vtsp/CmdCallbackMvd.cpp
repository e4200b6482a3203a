#include "CmdCallbackMvd.h"

#include <android/log.h>

namespace android {

namespace {

constexpr const char* kTag = "CmdclbMVD";

#define LOGD(...) __android_log_print(ANDROID_LOG_DEBUG, kTag, __VA_ARGS__)

}  // namespace

CmdCallbackMvd::CmdCallbackMvd(std::shared_ptr<CameraCodecParameter> table)
        : mCameraCodecParameter(std::move(table)),
          mCameraConfig(CameraCodecParameter::CAMERA_VGA_REVERSED_30FPS),
          mCaptureId(kFrontCameraName) {}

CmdCallbackMvd::~CmdCallbackMvd() {
    mStreams.clear();
}

template <typename Fn>
void CmdCallbackMvd::forEachStream(Fn fn) {
    for (auto& entry : mStreams) fn(*entry.second);
}

uint32_t CmdCallbackMvd::commandStreamId(const VtspCommand& c) {
    if (c.code == _VTSP_CMD_CONFIG) return static_cast<uint32_t>(static_cast<int32_t>(c.u.config.data[1]));
    return c.u.stmVideo.streamId;
}

CmdBuffer* CmdCallbackMvd::parse(const CmdBuffer& cmd) {
    const VtspCommand& c = cmd.command();
    const uint32_t streamId = commandStreamId(c);
    std::lock_guard<std::mutex> lock(mMutex);
    PublishOnExit publish{*this, streamId};

    switch (c.code) {
        case _VTSP_CMD_STREAM_VIDEO_START:
        case _VTSP_CMD_STREAM_VIDEO_MODITY:
        case _VTSP_CMD_STREAM_VIDEO_END:
            break;
        case _VTSP_CMD_CONFIG:
            LOGD("_VTSP_CMD_CONFIG, streamId %d", int(streamId));
            if (mStreams.find(streamId) == mStreams.end()) {
                LOGD("stream is not created, streamId %d", int(streamId));
                return nullptr;
            }
            break;
        default:
            LOGD("code %d, not supported yet, ignore it", c.code);
            return nullptr;
    }

    const auto it = mStreams.find(streamId);
    if (it != mStreams.end()) {
        LOGD("exsited stream, streamId %d", int(streamId));
        CmdBuffer* reply = it->second->parse(cmd);
        if (!it->second->isAlive()) {
            LOGD("delelte the stream, streamId %d", int(streamId));
            mStreams.erase(it);
        }
        return reply;
    }

    LOGD("%s: keep new stream, streamId %d", "parse", int(streamId));
    auto stream = std::make_shared<StreamInfoMvd>(mCameraCodecParameter, mCameraConfig, mCaptureId);
    CmdBuffer* reply = stream->parse(cmd);
    if (stream->isAlive()) mStreams[streamId] = stream;
    return reply;
}

void CmdCallbackMvd::setCaptureId(const char* id) {
    std::lock_guard<std::mutex> lock(mMutex);
    PublishOnExit publish{*this, std::nullopt};
    if (id != nullptr) mCaptureId = id;
    forEachStream([id](StreamInfoMvd& s) { s.setCaptureId(id); });
}

void CmdCallbackMvd::setRenderId(const char* id) {
    std::lock_guard<std::mutex> lock(mMutex);
    PublishOnExit publish{*this, std::nullopt};
    forEachStream([id](StreamInfoMvd& s) { s.setRenderId(id); });
}

void CmdCallbackMvd::setCodecParam(CameraCodecParameter::CameraConfigEnum config) {
    std::lock_guard<std::mutex> lock(mMutex);
    PublishOnExit publish{*this, std::nullopt};
    mCameraConfig = config;
    forEachStream([config](StreamInfoMvd& s) { s.setCodecParam(config); });
}

void CmdCallbackMvd::sendReplacedImage(bool start, const char* path) {
    std::lock_guard<std::mutex> lock(mMutex);
    PublishOnExit publish{*this, std::nullopt};
    forEachStream([start, path](StreamInfoMvd& s) { s.sendReplacedImage(start, path); });
}

size_t CmdCallbackMvd::streamCount() {
    std::lock_guard<std::mutex> lock(mMutex);
    return mStreams.size();
}

std::optional<StreamSnapshot> CmdCallbackMvd::snapshot(uint32_t streamId) {
    std::lock_guard<std::mutex> lock(mMutex);
    const auto it = mStreams.find(streamId);
    if (it == mStreams.end()) return std::nullopt;
    return it->second->snapshot();
}

std::vector<StreamSnapshot> CmdCallbackMvd::snapshots() {
    std::lock_guard<std::mutex> lock(mMutex);
    std::vector<StreamSnapshot> out;
    out.reserve(mStreams.size());
    forEachStream([&out](StreamInfoMvd& s) { out.push_back(s.snapshot()); });
    return out;
}

CameraCodecParameter::CameraConfigEnum CmdCallbackMvd::cameraConfig() {
    std::lock_guard<std::mutex> lock(mMutex);
    return mCameraConfig;
}

void CmdCallbackMvd::publishStream(uint32_t streamId) {
    const auto it = mStreams.find(streamId);
    std::optional<StreamSnapshot> stream;
    if (it != mStreams.end()) stream = it->second->snapshot();
    std::lock_guard<std::mutex> lock(mPublishedLock);
    if (stream) {
        mPublished.insert_or_assign(streamId, *stream);
    } else {
        mPublished.erase(streamId);
    }
}

void CmdCallbackMvd::publishStreams() {
    std::map<uint32_t, StreamSnapshot> streams;
    for (const auto& entry : mStreams) streams.emplace(entry.first, entry.second->snapshot());
    std::lock_guard<std::mutex> lock(mPublishedLock);
    mPublished.swap(streams);
}

std::vector<StreamSnapshot> CmdCallbackMvd::publishedStreams() const {
    std::lock_guard<std::mutex> lock(mPublishedLock);
    std::vector<StreamSnapshot> out;
    out.reserve(mPublished.size());
    for (const auto& entry : mPublished) out.push_back(entry.second);
    return out;
}

const char* CmdCallbackMvd::captureId() {
    std::lock_guard<std::mutex> lock(mMutex);
    return mCaptureId;
}

}  // namespace android
