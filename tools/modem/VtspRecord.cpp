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

bool parseEndpoint(const std::string& text, OSAL_NetAddress* out) {
    if (text == "none") {
        *out = noAddress();
        return true;
    }
    std::string host, port;
    if (!text.empty() && text[0] == '[') {
        const size_t close = text.find(']');
        if (close == std::string::npos || close + 1 >= text.size() || text[close + 1] != ':') return false;
        host = text.substr(1, close - 1);
        port = text.substr(close + 2);
    } else {
        const size_t colon = text.rfind(':');
        if (colon == std::string::npos) return false;
        host = text.substr(0, colon);
        port = text.substr(colon + 1);
    }
    if (host.empty() || host.find('\0') != std::string::npos || port.empty() || port.size() > 5 ||
        port.find_first_not_of("0123456789") != std::string::npos) {
        return false;
    }
    const unsigned long value = std::stoul(port);
    return value <= 0xFFFF && parseAddress(host, static_cast<uint16_t>(value), out);
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

std::string endpointText(const OSAL_NetAddress& addr) {
    if (addr.type == kAddrTypeIpv6 || addr.type == kAddrTypeIpv6Alt) {
        uint8_t bytes[16];
        for (int i = 0; i < 8; ++i) {
            bytes[2 * i] = static_cast<uint8_t>(addr.ipv6[i] >> 8);
            bytes[2 * i + 1] = static_cast<uint8_t>(addr.ipv6[i]);
        }
        char text[INET6_ADDRSTRLEN];
        inet_ntop(AF_INET6, bytes, text, sizeof(text));
        return "[" + std::string(text) + "]:" + std::to_string(addr.port);
    }
    const std::string ip = addressText(addr);
    return ip == "-" ? ip : ip + ":" + std::to_string(addr.port);
}

const char* directionName(uint32_t dir) {
    static const char* const kNames[] = {"ended", "inactive", "sendonly", "recvonly", "sendrecv"};
    return dir < sizeof(kNames) / sizeof(kNames[0]) ? kNames[dir] : nullptr;
}

const char* commandName(int32_t code) {
    switch (code) {
        case _VTSP_CMD_CONFIG: return "CONFIG";
        case _VTSP_CMD_STREAM_VIDEO_START: return "START";
        case _VTSP_CMD_STREAM_VIDEO_MODITY: return "MODIFY";
        case _VTSP_CMD_STREAM_VIDEO_END: return "END";
        default: return nullptr;
    }
}

}  // namespace vtspcodec
