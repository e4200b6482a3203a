#include "VtspRecord.h"

#include <arpa/inet.h>

#include <algorithm>
#include <cstring>

#include "CmdBuffer.h"

namespace vtspcodec {

using namespace android;

OSAL_NetAddress noAddress() {
    OSAL_NetAddress a{};
    a.type = 4;
    return a;
}

bool parseAddress(const std::string& ip, uint16_t port, OSAL_NetAddress* out) {
    OSAL_NetAddress a{};
    a.port = port;
    if (inet_pton(AF_INET, ip.c_str(), a.ipv4) == 1) {
        a.type = kAddrTypeIpv4;
    } else {
        uint8_t bytes[16];
        if (inet_pton(AF_INET6, ip.c_str(), bytes) != 1) return false;
        for (int i = 0; i < 8; ++i) a.ipv6[i] = static_cast<uint16_t>(bytes[2 * i] << 8 | bytes[2 * i + 1]);
        a.type = kAddrTypeIpv6;
    }
    *out = a;
    return true;
}

OSAL_NetAddress address(const std::string& ip, uint16_t port) {
    OSAL_NetAddress a = noAddress();
    parseAddress(ip, port, &a);
    return a;
}

namespace {

VPR_Comm emptyRecord(uint32_t type, uint32_t targetModule) {
    VPR_Comm record{};
    record.type = type;
    record.targetModule = targetModule;
    record.recordLength = kVprCommSize;
    return record;
}

}  // namespace

VPR_Comm streamRecord(const StreamCommand& cmd, uint32_t type, uint32_t targetModule) {
    VPR_Comm record = emptyRecord(type, targetModule);
    VtspCommand body{};
    body.code = cmd.code;
    body.infc = cmd.infc;
    VtspStmVideoView& v = body.u.stmVideo;
    v.streamId = cmd.streamId;
    v.dir = cmd.dir;
    v.encoder = cmd.encoder;
    v.encodeType[0] = cmd.encodeType[0];
    v.encodeType[1] = cmd.encodeType[1];
    v.extension = cmd.extension;
    v.extmapId = cmd.extmapId;
    memcpy(v.extmapUri, cmd.extmapUri.data(), std::min(cmd.extmapUri.size(), kExtmapUriSize));
    v.confMask = cmd.confMask;
    v.rdnDynType = cmd.rdnDynType;
    v.remoteAddr = cmd.remoteAddr;
    v.remoteControlPort = cmd.remoteControlPort;
    v.localAddr = cmd.localAddr;
    v.localControlPort = cmd.localControlPort;
    v.localVideoAsBwKbps = cmd.localVideoAsBwKbps;
    v.remoteVideoAsBwKbps = cmd.remoteVideoAsBwKbps;
    // The modem sends ports and IPv6 groups big-endian.
    swapAddress(v.remoteAddr);
    swapAddress(v.localAddr);
    swap16(v.remoteControlPort);
    swap16(v.localControlPort);
    memcpy(record.body, &body, sizeof(body));
    return record;
}

VPR_Comm configRecord(const ConfigCommand& cmd, uint32_t type, uint32_t targetModule) {
    VPR_Comm record = emptyRecord(type, targetModule);
    VtspCommand body{};
    body.code = _VTSP_CMD_CONFIG;
    body.infc = cmd.infc;
    body.u.config.templCode = cmd.templCode;
    memcpy(body.u.config.data, cmd.data, sizeof(cmd.data));
    memcpy(record.body, &body, sizeof(body));
    return record;
}

VPR_Comm commandRecord(int32_t code, uint32_t type, uint32_t targetModule) {
    VPR_Comm record = emptyRecord(type, targetModule);
    memcpy(record.body, &code, sizeof(code));
    return record;
}

BindRequest readBindRequest(const VPR_Comm& record) {
    BindRequest out;
    VprNetBind body;
    memcpy(&body, record.body, sizeof(body));
    swapAddress(body.addr);
    out.code = body.code;
    out.streamId = body.streamId;
    out.addr = body.addr;
    out.type = record.type;
    out.targetModule = record.targetModule;
    out.recordLength = record.recordLength;
    return out;
}

std::string addressText(const OSAL_NetAddress& addr) {
    char text[kIpTextSize];
    switch (addr.type) {
        case kAddrTypeIpv4:
        case kAddrTypeIpv4Alt:
            ConvertIpToString(text, addr.ipv4, true);
            return text;
        case kAddrTypeIpv6:
        case kAddrTypeIpv6Alt:
            ConvertIpToString(text, addr.ipv6, false);
            return text;
        default:
            return "-";
    }
}

}  // namespace vtspcodec
