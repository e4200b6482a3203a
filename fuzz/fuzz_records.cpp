// Arbitrary bytes as a stream of 3664-byte modem records, handled the way the
// link's receive and handling threads handle them, without the threads: a
// fresh dispatcher per input keeps every run independent of the previous one.
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <memory>

#include "CameraCodecParameter.h"
#include "CmdBuffer.h"
#include "CmdCallbackMvd.h"
#include "FuzzSupport.h"
#include "HostFakes.h"
#include "VprComm.h"

using namespace android;

namespace {

std::shared_ptr<CameraCodecParameter> filledTable() {
    auto table = std::make_shared<CameraCodecParameter>();
    table->fill(CameraCodecParameter::CODEC_H264);
    table->fill(CameraCodecParameter::CODEC_OTHER);
    return table;
}

}  // namespace

extern "C" int LLVMFuzzerInitialize(int* /*argc*/, char*** /*argv*/) {
    fuzzsupport::quietLog();
    return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    static const std::shared_ptr<CameraCodecParameter> table = filledTable();
    // The fakes record every call; forgetting them keeps memory flat.
    hostfakes::reset();
    {
        CmdCallbackMvd dispatcher(table);
        // A running engine has told the dispatcher its camera and render.
        dispatcher.setCaptureId("Camera 1, Facing front, Orientation 270");
        dispatcher.setRenderId("RemoteView");
        auto record = std::make_unique<VPR_Comm>();
        for (size_t at = 0; at + kVprCommSize <= size; at += kVprCommSize) {
            std::memcpy(record.get(), data + at, kVprCommSize);
            // Routing as the receive thread does: only video commands of type 0
            // reach the handling thread.
            if (record->targetModule != VPMD_VIDEO_CMDEVT_TARGET || record->type != 0) continue;
            auto cmd = std::make_shared<CmdBuffer>(VPR_COMM_VTSP_CMD, record->body);
            cmd->translate(true);
            cmd->print();
            std::unique_ptr<CmdBuffer> reply(dispatcher.parse(*cmd));
            if (reply != nullptr) {
                reply->translate(false);
                VPR_Comm out{};
                reply->compose(&out);
            }
        }
    }
    return 0;
}
