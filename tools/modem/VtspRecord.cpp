#include "VtspRecord.h"

#include <arpa/inet.h>

#include <algorithm>
#include <cstring>

#include "CmdBuffer.h"
#include "WireBytes.h"

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

using namespace vtspwire;

uint8_t* bytesOf(VPR_Comm& record) { return reinterpret_cast<uint8_t*>(&record); }
const uint8_t* bytesOf(const VPR_Comm& record) { return reinterpret_cast<const uint8_t*>(&record); }

VPR_Comm emptyRecord(uint32_t type, uint32_t targetModule) {
    VPR_Comm record;
    memset(&record, 0, sizeof(record));
    putLe32(bytesOf(record), kTypeOffset, type);
    putLe32(bytesOf(record), kTargetOffset, targetModule);
    putLe32(bytesOf(record), kLengthOffset, kRecordSize);
    return record;
}

void putAddress(uint8_t* p, size_t at, const OSAL_NetAddress& a) {
    for (size_t i = 0; i < 4; ++i) p[at + kAddrIpv4 + i] = a.ipv4[i];
    for (size_t i = 0; i < 8; ++i) putBe16(p, at + kAddrIpv6 + 2 * i, a.ipv6[i]);
    putBe16(p, at + kAddrPort, a.port);
    putLe32(p, at + kAddrType, a.type);
}

OSAL_NetAddress getAddress(const uint8_t* p, size_t at) {
    OSAL_NetAddress a{};
    for (size_t i = 0; i < 4; ++i) a.ipv4[i] = p[at + kAddrIpv4 + i];
    for (size_t i = 0; i < 8; ++i) a.ipv6[i] = getBe16(p, at + kAddrIpv6 + 2 * i);
    a.port = getBe16(p, at + kAddrPort);
    a.type = getLe32(p, at + kAddrType);
    return a;
}

}  // namespace

VPR_Comm streamRecord(const StreamCommand& cmd, uint32_t type, uint32_t targetModule) {
    VPR_Comm record = emptyRecord(type, targetModule);
    uint8_t* p = bytesOf(record);
    putLe32(p, kCode, static_cast<uint32_t>(cmd.code));
    putLe16(p, kInfc, cmd.infc);
    putLe32(p, kStreamId, cmd.streamId);
    putLe32(p, kDir, cmd.dir);
    putLe32(p, kEncoder, cmd.encoder);
    putLe32(p, kEncodeType, cmd.encodeType[0]);
    putLe32(p, kEncodeType + 4, cmd.encodeType[1]);
    putLe32(p, kExtension, cmd.extension);
    putLe32(p, kExtmapId, cmd.extmapId);
    memcpy(p + kExtmapUri, cmd.extmapUri.data(), std::min(cmd.extmapUri.size(), kExtmapUriBytes));
    putLe32(p, kConfMask, cmd.confMask);
    p[kRdnDynType] = cmd.rdnDynType;
    putAddress(p, kRemoteAddr, cmd.remoteAddr);
    putBe16(p, kRemoteControlPort, cmd.remoteControlPort);
    putAddress(p, kLocalAddr, cmd.localAddr);
    putBe16(p, kLocalControlPort, cmd.localControlPort);
    putLe32(p, kLocalBw, cmd.localVideoAsBwKbps);
    putLe32(p, kRemoteBw, cmd.remoteVideoAsBwKbps);
    return record;
}

VPR_Comm configRecord(const ConfigCommand& cmd, uint32_t type, uint32_t targetModule) {
    VPR_Comm record = emptyRecord(type, targetModule);
    uint8_t* p = bytesOf(record);
    putLe32(p, kCode, static_cast<uint32_t>(_VTSP_CMD_CONFIG));
    putLe16(p, kInfc, cmd.infc);
    putLe32(p, kTemplCode, cmd.templCode);
    for (size_t i = 0; i < 3; ++i) putLe16(p, kConfigData + 2 * i, static_cast<uint16_t>(cmd.data[i]));
    return record;
}

VPR_Comm commandRecord(int32_t code, uint32_t type, uint32_t targetModule) {
    VPR_Comm record = emptyRecord(type, targetModule);
    putLe32(bytesOf(record), kCode, static_cast<uint32_t>(code));
    return record;
}

Trailer trailerOf(const VPR_Comm& record) {
    const uint8_t* p = bytesOf(record);
    return {getLe32(p, kTypeOffset), getLe32(p, kTargetOffset), getLe32(p, kLengthOffset)};
}

int32_t codeOf(const VPR_Comm& record) { return static_cast<int32_t>(getLe32(bytesOf(record), kCode)); }

StreamCommand readStreamCommand(const VPR_Comm& record) {
    const uint8_t* p = bytesOf(record);
    StreamCommand c;
    c.code = codeOf(record);
    c.infc = getLe16(p, kInfc);
    c.streamId = getLe32(p, kStreamId);
    c.dir = getLe32(p, kDir);
    c.encoder = getLe32(p, kEncoder);
    c.encodeType[0] = getLe32(p, kEncodeType);
    c.encodeType[1] = getLe32(p, kEncodeType + 4);
    c.extension = getLe32(p, kExtension);
    c.extmapId = getLe32(p, kExtmapId);
    const char* uri = reinterpret_cast<const char*>(p + kExtmapUri);
    c.extmapUri.assign(uri, strnlen(uri, kExtmapUriBytes));
    c.confMask = getLe32(p, kConfMask);
    c.rdnDynType = p[kRdnDynType];
    c.remoteAddr = getAddress(p, kRemoteAddr);
    c.remoteControlPort = getBe16(p, kRemoteControlPort);
    c.localAddr = getAddress(p, kLocalAddr);
    c.localControlPort = getBe16(p, kLocalControlPort);
    c.localVideoAsBwKbps = getLe32(p, kLocalBw);
    c.remoteVideoAsBwKbps = getLe32(p, kRemoteBw);
    return c;
}

ConfigCommand readConfigCommand(const VPR_Comm& record) {
    const uint8_t* p = bytesOf(record);
    ConfigCommand c;
    c.infc = getLe16(p, kInfc);
    c.templCode = getLe32(p, kTemplCode);
    for (size_t i = 0; i < 3; ++i) c.data[i] = static_cast<int16_t>(getLe16(p, kConfigData + 2 * i));
    return c;
}

BindRequest readBindRequest(const VPR_Comm& record) {
    const uint8_t* p = bytesOf(record);
    BindRequest out;
    out.code = getLe32(p, kBindCode);
    out.streamId = static_cast<int32_t>(getLe32(p, kBindStreamId));
    out.addr = getAddress(p, kBindAddr);
    const Trailer t = trailerOf(record);
    out.type = t.type;
    out.targetModule = t.targetModule;
    out.recordLength = t.recordLength;
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
