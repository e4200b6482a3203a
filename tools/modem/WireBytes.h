// The modem's side of the record layout, byte by byte: every field is put at
// the offset docs/vtsp-record.md gives it, little-endian unless that page
// says big-endian. Nothing here goes through the system's structures or its
// byte swaps, so a test that compares the system's bytes with these compares
// them with an independent reading of the format.
#ifndef QUELLBORN_TOOLS_WIREBYTES_H
#define QUELLBORN_TOOLS_WIREBYTES_H

#include <cstddef>
#include <cstdint>

namespace vtspwire {

// The record and its trailer.
constexpr size_t kRecordSize = 3664;
constexpr size_t kTypeOffset = 3652;
constexpr size_t kTargetOffset = 3656;
constexpr size_t kLengthOffset = 3660;

// Inside an address (28 bytes).
constexpr size_t kAddrIpv4 = 0;
constexpr size_t kAddrIpv6 = 4;
constexpr size_t kAddrPort = 20;
constexpr size_t kAddrType = 24;

// Inside a command body.
constexpr size_t kCode = 0;
constexpr size_t kInfc = 4;
constexpr size_t kStreamId = 8;
constexpr size_t kDir = 12;
constexpr size_t kTemplCode = 8;
constexpr size_t kConfigData = 12;  // three s16
constexpr size_t kEncoder = 20;
constexpr size_t kEncodeType = 56;  // two u32
constexpr size_t kExtension = 72;
constexpr size_t kExtmapId = 76;
constexpr size_t kExtmapUri = 80;
constexpr size_t kExtmapUriBytes = 128;
constexpr size_t kConfMask = 208;
constexpr size_t kRdnDynType = 212;
constexpr size_t kRemoteAddr = 216;
constexpr size_t kRemoteControlPort = 244;
constexpr size_t kLocalAddr = 248;
constexpr size_t kLocalControlPort = 276;
constexpr size_t kLocalBw = 280;
constexpr size_t kRemoteBw = 284;

// Inside a bind request body.
constexpr size_t kBindCode = 0;
constexpr size_t kBindStreamId = 4;
constexpr size_t kBindAddr = 8;

inline void putLe16(uint8_t* p, size_t at, uint16_t v) {
    p[at] = static_cast<uint8_t>(v);
    p[at + 1] = static_cast<uint8_t>(v >> 8);
}
inline void putBe16(uint8_t* p, size_t at, uint16_t v) {
    p[at] = static_cast<uint8_t>(v >> 8);
    p[at + 1] = static_cast<uint8_t>(v);
}
inline void putLe32(uint8_t* p, size_t at, uint32_t v) {
    for (size_t i = 0; i < 4; ++i) p[at + i] = static_cast<uint8_t>(v >> (8 * i));
}
inline uint16_t getLe16(const uint8_t* p, size_t at) { return static_cast<uint16_t>(p[at] | p[at + 1] << 8); }
inline uint16_t getBe16(const uint8_t* p, size_t at) { return static_cast<uint16_t>(p[at] << 8 | p[at + 1]); }
inline uint32_t getLe32(const uint8_t* p, size_t at) {
    uint32_t v = 0;
    for (size_t i = 0; i < 4; ++i) v |= static_cast<uint32_t>(p[at + i]) << (8 * i);
    return v;
}

}  // namespace vtspwire

#endif  // QUELLBORN_TOOLS_WIREBYTES_H
