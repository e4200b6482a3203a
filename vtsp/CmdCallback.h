// What the link and the engine can ask of the stream side: the dispatcher
// and every stream implement it.
#ifndef QUELLBORN_VTSP_CMDCALLBACK_H
#define QUELLBORN_VTSP_CMDCALLBACK_H

#include "CameraCodecParameter.h"
#include "CmdBuffer.h"

namespace android {

class CmdCallback {
public:
    // Acts on a command (host byte order); returns a reply for the modem
    // that the caller owns, or null.
    virtual CmdBuffer* parse(const CmdBuffer& cmd) = 0;
    virtual void setCaptureId(const char* id) = 0;
    virtual void setRenderId(const char* id) = 0;
    virtual void setCodecParam(CameraCodecParameter::CameraConfigEnum config) = 0;
    virtual void sendReplacedImage(bool start, const char* path) = 0;
    virtual ~CmdCallback() = default;
};

// Capture names of the two cameras; also the camera driver's and the media
// engine's names for them.
constexpr const char* kFrontCameraName = "Camera 1, Facing front, Orientation 270";
constexpr const char* kBackCameraName = "Camera 0, Facing back, Orientation 90";
// Render name of the remote party's picture.
constexpr const char* kRemoteRenderName = "Remote";

}  // namespace android

#endif  // QUELLBORN_VTSP_CMDCALLBACK_H
