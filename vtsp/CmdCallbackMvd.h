// Routes the modem's commands to their streams by VTSP stream id and fans the
// engine's camera, render, capture-size and still-image choices out to every
// stream. One mutex serialises all of it, media engine calls included.
#ifndef QUELLBORN_VTSP_CMDCALLBACKMVD_H
#define QUELLBORN_VTSP_CMDCALLBACKMVD_H

#include <cstdint>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <vector>

#include "CameraCodecParameter.h"
#include "CmdCallback.h"
#include "StreamInfoMvd.h"

namespace android {

class CmdCallbackMvd : public CmdCallback {
public:
    explicit CmdCallbackMvd(std::shared_ptr<CameraCodecParameter> table);
    ~CmdCallbackMvd() override;
    CmdCallbackMvd(const CmdCallbackMvd&) = delete;
    CmdCallbackMvd& operator=(const CmdCallbackMvd&) = delete;

    CmdBuffer* parse(const CmdBuffer& cmd) override;
    // The stream a command is for: a configuration names it in its data.
    static uint32_t commandStreamId(const VtspCommand& c);
    // The dispatcher and its streams keep the pointers given to the two
    // setters below: callers pass texts that live for the process (the
    // camera and render name constants, or names the engine keeps).
    void setCaptureId(const char* id) override;
    void setRenderId(const char* id) override;
    void setCodecParam(CameraCodecParameter::CameraConfigEnum config) override;
    void sendReplacedImage(bool start, const char* path) override;

    // Diagnostics for tools and tests: copies taken under the lock, since the
    // handling thread may change a stream at any moment.
    size_t streamCount();
    std::optional<StreamSnapshot> snapshot(uint32_t streamId);
    std::vector<StreamSnapshot> snapshots();  // in ascending stream id order
    CameraCodecParameter::CameraConfigEnum cameraConfig();
    const char* captureId();
    // The streams as the last command or setter left them, ascending by
    // stream id. Copied under the dispatcher's lock as each operation ends;
    // reading them never waits for an operation in progress, and so never
    // for the media engine.
    std::vector<StreamSnapshot> publishedStreams() const;

private:
    // Declared after the dispatcher's lock is taken: publishes on every way
    // out. A command changes only its own stream, and copying every stream
    // after each command would make the handling thread's cost grow with the
    // number of streams.
    struct PublishOnExit {
        CmdCallbackMvd& dispatcher;
        std::optional<uint32_t> onlyStream;  // empty: every stream may have changed
        ~PublishOnExit() { onlyStream ? dispatcher.publishStream(*onlyStream) : dispatcher.publishStreams(); }
    };
    void publishStream(uint32_t streamId);
    void publishStreams();

    template <typename Fn>
    void forEachStream(Fn fn);

    std::map<uint32_t, std::shared_ptr<StreamInfoMvd>> mStreams;
    std::shared_ptr<CameraCodecParameter> mCameraCodecParameter;
    CameraCodecParameter::CameraConfigEnum mCameraConfig;
    const char* mCaptureId;
    std::mutex mMutex;
    mutable std::mutex mPublishedLock;
    std::map<uint32_t, StreamSnapshot> mPublished;
};

}  // namespace android

#endif  // QUELLBORN_VTSP_CMDCALLBACKMVD_H
