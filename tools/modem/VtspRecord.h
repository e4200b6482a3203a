// Builds and reads modem pipe records the way the modem does: the tools'
// and the tests' side of the wire. Everything produced here is in wire order
// (ports and IPv6 groups big-endian), ready to be written into the pipe. The
// bytes are put and read field by field at their documented offsets
// (WireBytes.h), never through the system's structures or swaps, so tests
// that compare with them compare with an independent oracle.
#ifndef QUELLBORN_TOOLS_VTSPRECORD_H
#define QUELLBORN_TOOLS_VTSPRECORD_H

#include <cstdint>
#include <string>

#include "VprComm.h"

namespace vtspcodec {

using android::OSAL_NetAddress;
using android::VPR_Comm;

// An address with no usable family (type 4), as the modem sends for an end
// it does not know yet.
OSAL_NetAddress noAddress();
// "10.0.0.1" or "fe80::1" (host order groups; the port in host order too).
bool parseAddress(const std::string& ip, uint16_t port, OSAL_NetAddress* out);
OSAL_NetAddress address(const std::string& ip, uint16_t port);
// "10.0.0.1:6000", "[fe80::1]:6000", "fe80::1:6000" (the last colon starts
// the port) or "none" (no address); false for anything else.
bool parseEndpoint(const std::string& text, OSAL_NetAddress* out);

struct StreamCommand {
    int32_t code = android::_VTSP_CMD_STREAM_VIDEO_START;
    uint16_t infc = 0;
    uint32_t streamId = 0;
    uint32_t dir = android::VTSP_STREAM_DIR_SENDRECV;
    uint32_t encoder = 0;
    uint32_t encodeType[2] = {96, 0};
    uint32_t extension = 0;
    uint32_t extmapId = 0;
    std::string extmapUri;
    uint32_t confMask = 0;
    uint8_t rdnDynType = 0;
    OSAL_NetAddress remoteAddr = noAddress();
    uint16_t remoteControlPort = 0;
    OSAL_NetAddress localAddr = noAddress();
    uint16_t localControlPort = 0;
    uint32_t localVideoAsBwKbps = 0;
    uint32_t remoteVideoAsBwKbps = 0;
};

struct ConfigCommand {
    uint16_t infc = 0;
    uint32_t templCode = android::TEMPL_RTCP_FB;
    int16_t data[3] = {1, 0, 0};  // switch, stream id, value
};

// Whole 3664-byte records in wire order. `type` and `targetModule` go into
// the trailer; recordLength is always 3664.
VPR_Comm streamRecord(const StreamCommand& cmd, uint32_t type = 0, uint32_t targetModule = 0);
VPR_Comm configRecord(const ConfigCommand& cmd, uint32_t type = 0, uint32_t targetModule = 0);
VPR_Comm commandRecord(int32_t code, uint32_t type = 0, uint32_t targetModule = 0);

// The record's trailer, read from its bytes.
struct Trailer {
    uint32_t type = 0;
    uint32_t targetModule = 0;
    uint32_t recordLength = 0;
};
Trailer trailerOf(const VPR_Comm& record);
// The command code at the start of the body.
int32_t codeOf(const VPR_Comm& record);
// A command body read back in host terms (the stream view and the config
// view of the same bytes).
StreamCommand readStreamCommand(const VPR_Comm& record);
ConfigCommand readConfigCommand(const VPR_Comm& record);

// A received bind request, converted to host order.
struct BindRequest {
    uint32_t code = 0;
    int32_t streamId = 0;
    OSAL_NetAddress addr{};
    uint32_t type = 0;
    uint32_t targetModule = 0;
    uint32_t recordLength = 0;
};
BindRequest readBindRequest(const VPR_Comm& record);

// "10.0.0.1" / "fe80:0:0:0:0:0:0:1" of a host-order address, "-" for none.
std::string addressText(const OSAL_NetAddress& addr);

// "10.0.0.1:6000" or "[2001:db8::1]:6000" (IPv6 compressed) of a host-order
// address, "-" for none.
std::string endpointText(const OSAL_NetAddress& addr);

// Lower-case direction names ("ended" .. "sendrecv"); null for a value that
// names no direction.
const char* directionName(uint32_t dir);
// Command code names ("START", "MODIFY", "END", "CONFIG"); null when unknown.
const char* commandName(int32_t code);

}  // namespace vtspcodec

#endif  // QUELLBORN_TOOLS_VTSPRECORD_H
