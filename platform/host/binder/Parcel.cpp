// Parcel for a host process: one address space, no binder driver.
//
// The byte layout is libbinder's: every item is padded to four bytes with
// zeros, strings are length-prefixed or NUL-terminated as there, and a binder
// or a file descriptor is a 24-byte flat_binder_object record. With no driver
// to translate and count references, the parcel keeps every object it carries
// alive itself: mObjects holds three words per object (the offset of its
// record, the binder's address or the descriptor, the kind), the parcel owns
// one strong reference per binder and each descriptor it holds, and an object
// is only ever read back from that table, never from the bytes. Bytes copied
// out of a parcel (setData) therefore carry no object and cannot forge one.
//
// A descriptor is duplicated when it is written, unless the parcel is given
// it to own: the receiving side of a driver gets a descriptor of its own that
// lives as long as the parcel, and so does the reader here.
#include <binder/Parcel.h>

#include <log/log.h>
#include <utils/String8.h>

#include <fcntl.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdlib>
#include <cstring>

namespace android {

// Parcel.h only forward-declares it; the kernel's layout for 64-bit processes.
struct flat_binder_object {
    uint32_t type;
    uint32_t flags;
    uint64_t binder;
    uint64_t cookie;
};
static_assert(sizeof(flat_binder_object) == 24, "the driver's record size");

namespace {

constexpr uint32_t kTypeBinder = B_PACK_CHARS('s', 'b', '*', 0x85);
constexpr uint32_t kTypeHandle = B_PACK_CHARS('s', 'h', '*', 0x85);
constexpr uint32_t kTypeFd = B_PACK_CHARS('f', 'd', '*', 0x85);
// FLAT_BINDER_FLAG_ACCEPTS_FDS with the lowest scheduling priority, as a
// local binder is written on a device.
constexpr uint32_t kLocalBinderFlags = 0x100 | 0x7f;

constexpr size_t kMaxSize = INT32_MAX;
constexpr size_t kRecordSize = sizeof(flat_binder_object);
// mObjects words per carried object: [offset of the record, IBinder* or
// descriptor, kind].
constexpr size_t kObjectWords = 3;
enum ObjectKind : binder_size_t { kBinderObject = 0, kFdObject = 1 };

// Written in front of an interface token, as libbinder of this header's
// release does: the strict-mode policy with PENALTY_GATHER, then the unset
// work source.
constexpr int32_t kStrictModePenaltyGather = INT32_MIN;
constexpr int32_t kUnsetWorkSource = -1;

size_t padSize(size_t s) { return (s + 3) & ~size_t(3); }

// Gives back what the parcel held for one table entry.
void releaseObject(const binder_size_t* entry, const void* owner) {
    if (entry[2] == kFdObject) {
        close(static_cast<int>(entry[1]));
    } else {
        reinterpret_cast<IBinder*>(entry[1])->decStrong(owner);
    }
}

}  // namespace

Parcel::Parcel() { initState(); }

Parcel::~Parcel() { freeDataNoInit(); }

void Parcel::initState() {
    mError = NO_ERROR;
    mData = nullptr;
    mDataSize = 0;
    mDataCapacity = 0;
    mDataPos = 0;
    mObjects = nullptr;
    mObjectsSize = 0;
    mObjectsCapacity = 0;
    mNextObjectHint = 0;
    mObjectsSorted = false;
    mRequestHeaderPresent = false;
    mWorkSourceRequestHeaderPosition = 0;
    mFdsKnown = true;
    mHasFds = false;
    mAllowFds = true;
    mOwner = nullptr;
    mOwnerCookie = nullptr;
    mOpenAshmemSize = 0;
}

void Parcel::releaseObjects() {
    // Detach the table before dropping references: a binder destroyed here
    // may itself free parcels, and must not find this one half released.
    const size_t count = mObjectsSize;
    mObjectsSize = 0;
    for (size_t i = 0; i < count; ++i) releaseObject(mObjects + i * kObjectWords, this);
}

void Parcel::freeDataNoInit() {
    releaseObjects();
    free(mData);
    free(mObjects);
}

void Parcel::freeData() {
    freeDataNoInit();
    initState();
}

const uint8_t* Parcel::data() const { return mData; }
size_t Parcel::dataSize() const { return mDataSize; }
size_t Parcel::dataAvail() const { return mDataPos < mDataSize ? mDataSize - mDataPos : 0; }
size_t Parcel::dataPosition() const { return mDataPos; }
size_t Parcel::dataCapacity() const { return mDataCapacity; }
size_t Parcel::objectsCount() const { return mObjectsSize; }
status_t Parcel::errorCheck() const { return mError; }
void Parcel::setError(status_t err) { mError = err; }

void Parcel::setDataPosition(size_t pos) const {
    LOG_ALWAYS_FATAL_IF(pos > kMaxSize, "Parcel position too big: %zu", pos);
    mDataPos = pos;
    mNextObjectHint = 0;
    mObjectsSorted = false;
}

// Makes room for `desired` bytes; when shrinking, drops the binders whose
// records no longer fit and pulls size and position back.
status_t Parcel::continueWrite(size_t desired) {
    if (desired > kMaxSize) {
        mError = BAD_VALUE;
        return BAD_VALUE;
    }
    size_t kept = 0;
    for (size_t i = 0; i < mObjectsSize; ++i) {
        binder_size_t* entry = mObjects + i * kObjectWords;
        if (entry[0] + kRecordSize <= desired) {
            std::copy(entry, entry + kObjectWords, mObjects + kept * kObjectWords);
            ++kept;
        } else {
            releaseObject(entry, this);
        }
    }
    mObjectsSize = kept;

    if (desired > mDataCapacity) {
        auto* data = static_cast<uint8_t*>(realloc(mData, desired));
        if (data == nullptr) {
            mError = NO_MEMORY;
            return NO_MEMORY;
        }
        memset(data + mDataCapacity, 0, desired - mDataCapacity);
        mData = data;
        mDataCapacity = desired;
    } else {
        mDataSize = std::min(mDataSize, desired);
        mDataPos = std::min(mDataPos, desired);
    }
    return NO_ERROR;
}

status_t Parcel::growData(size_t len) {
    const size_t end = std::max(mDataSize, mDataPos);
    if (len > kMaxSize || end + len > kMaxSize) return BAD_VALUE;
    const size_t wanted = std::max<size_t>((end + len) * 3 / 2, 128);
    return continueWrite(std::max(end + len, std::min(wanted, kMaxSize)));
}

status_t Parcel::restartWrite(size_t desired) {
    releaseObjects();
    mDataSize = 0;
    mDataPos = 0;
    return continueWrite(desired);
}

status_t Parcel::setDataSize(size_t size) {
    if (size > kMaxSize) return BAD_VALUE;
    status_t err = continueWrite(size);
    if (err != NO_ERROR) return err;
    // Bytes that come back into the data read as zeros, not stale content.
    if (size > mDataSize) memset(mData + mDataSize, 0, size - mDataSize);
    mDataSize = size;
    return NO_ERROR;
}

status_t Parcel::setDataCapacity(size_t size) {
    if (size > kMaxSize) return BAD_VALUE;
    return size > mDataCapacity ? continueWrite(size) : NO_ERROR;
}

status_t Parcel::setData(const uint8_t* buffer, size_t len) {
    if (len > kMaxSize || (buffer == nullptr && len > 0)) return BAD_VALUE;
    status_t err = restartWrite(len);
    if (err == NO_ERROR && len > 0) {
        memcpy(mData, buffer, len);
        mDataSize = len;
    }
    return err;
}

status_t Parcel::finishWrite(size_t len) {
    mDataPos += len;
    mDataSize = std::max(mDataSize, mDataPos);
    return NO_ERROR;
}

void* Parcel::writeInplace(size_t len) {
    if (len > kMaxSize) return nullptr;
    const size_t padded = padSize(len);
    if (mDataPos + padded > mDataCapacity && growData(padded) != NO_ERROR) return nullptr;
    // A gap left by setDataPosition past the end reads as zeros.
    if (mDataPos > mDataSize) memset(mData + mDataSize, 0, mDataPos - mDataSize);
    uint8_t* out = mData + mDataPos;
    if (padded > len) memset(out + len, 0, padded - len);
    finishWrite(padded);
    return out;
}

status_t Parcel::write(const void* data, size_t len) {
    if (len > kMaxSize) return BAD_VALUE;
    if (len == 0) return NO_ERROR;
    void* out = writeInplace(len);
    if (out == nullptr) return mError != NO_ERROR ? mError : NO_MEMORY;
    memcpy(out, data, len);
    return NO_ERROR;
}

template <class T>
status_t Parcel::writeAligned(T val) {
    static_assert(sizeof(T) % 4 == 0, "only whole words keep the alignment");
    return write(&val, sizeof(val));
}

status_t Parcel::validateReadData(size_t upperBound) const {
    // Plain reads must not pick a binder record apart.
    for (size_t i = 0; i < mObjectsSize; ++i) {
        const size_t offset = mObjects[i * kObjectWords];
        if (mDataPos < offset + kRecordSize && offset < upperBound) return BAD_VALUE;
    }
    return NO_ERROR;
}

template <class T>
status_t Parcel::readAligned(T* pArg) const {
    if (mDataPos > mDataSize || sizeof(T) > mDataSize - mDataPos) return NOT_ENOUGH_DATA;
    if (mObjectsSize > 0) {
        status_t err = validateReadData(mDataPos + sizeof(T));
        if (err != NO_ERROR) {
            mDataPos += sizeof(T);
            return err;
        }
    }
    memcpy(pArg, mData + mDataPos, sizeof(T));
    mDataPos += sizeof(T);
    return NO_ERROR;
}

template <class T>
T Parcel::readAligned() const {
    T result;
    if (readAligned(&result) != NO_ERROR) result = 0;
    return result;
}

const void* Parcel::readInplace(size_t len) const {
    if (len > kMaxSize) return nullptr;
    const size_t padded = padSize(len);
    if (mDataPos > mDataSize || padded > mDataSize - mDataPos) return nullptr;
    if (mObjectsSize > 0 && validateReadData(mDataPos + padded) != NO_ERROR) {
        mDataPos += padded;
        return nullptr;
    }
    const void* data = mData + mDataPos;
    mDataPos += padded;
    return data;
}

status_t Parcel::read(void* outData, size_t len) const {
    if (len > kMaxSize) return BAD_VALUE;
    const void* data = readInplace(len);
    if (data == nullptr) return NOT_ENOUGH_DATA;
    if (len > 0) memcpy(outData, data, len);
    return NO_ERROR;
}

status_t Parcel::writeInt32(int32_t val) { return writeAligned(val); }
status_t Parcel::writeUint32(uint32_t val) { return writeAligned(val); }
status_t Parcel::writeInt64(int64_t val) { return writeAligned(val); }
status_t Parcel::writeUint64(uint64_t val) { return writeAligned(val); }
status_t Parcel::writeBool(bool val) { return writeInt32(val ? 1 : 0); }

int32_t Parcel::readInt32() const { return readAligned<int32_t>(); }
status_t Parcel::readInt32(int32_t* pArg) const { return readAligned(pArg); }
uint32_t Parcel::readUint32() const { return readAligned<uint32_t>(); }
status_t Parcel::readUint32(uint32_t* pArg) const { return readAligned(pArg); }
int64_t Parcel::readInt64() const { return readAligned<int64_t>(); }
status_t Parcel::readInt64(int64_t* pArg) const { return readAligned(pArg); }
uint64_t Parcel::readUint64() const { return readAligned<uint64_t>(); }
status_t Parcel::readUint64(uint64_t* pArg) const { return readAligned(pArg); }
bool Parcel::readBool() const { return readInt32() != 0; }

status_t Parcel::readBool(bool* pArg) const {
    int32_t value = 0;
    status_t err = readInt32(&value);
    *pArg = value != 0;
    return err;
}

status_t Parcel::writeCString(const char* str) {
    if (str == nullptr) return BAD_VALUE;
    return write(str, strlen(str) + 1);
}

const char* Parcel::readCString() const {
    if (mDataPos >= mDataSize) return nullptr;
    const char* str = reinterpret_cast<const char*>(mData + mDataPos);
    const void* eos = memchr(str, 0, mDataSize - mDataPos);
    if (eos == nullptr) return nullptr;
    mDataPos += padSize(static_cast<const char*>(eos) - str + 1);
    return str;
}

status_t Parcel::writeString8(const String8& str) {
    status_t err = writeInt32(static_cast<int32_t>(str.bytes()));
    // An empty string is its length alone: the reader stops at the zero.
    if (err == NO_ERROR && str.bytes() > 0) err = write(str.string(), str.bytes() + 1);
    return err;
}

status_t Parcel::readString8(String8* pArg) const {
    int32_t size = 0;
    status_t err = readInt32(&size);
    if (err != NO_ERROR) return err;
    if (size < 0 || size >= INT32_MAX) return BAD_VALUE;
    if (size == 0) {
        *pArg = String8();
        return NO_ERROR;
    }
    const char* str = static_cast<const char*>(readInplace(static_cast<size_t>(size) + 1));
    if (str == nullptr) return BAD_VALUE;
    pArg->setTo(str, static_cast<size_t>(size));
    return NO_ERROR;
}

String8 Parcel::readString8() const {
    String8 result;
    return readString8(&result) == NO_ERROR ? result : String8();
}

status_t Parcel::writeString16(const char16_t* str, size_t len) {
    if (str == nullptr) return writeInt32(-1);
    if (len >= kMaxSize / sizeof(char16_t)) return BAD_VALUE;
    status_t err = writeInt32(static_cast<int32_t>(len));
    if (err != NO_ERROR) return err;
    const size_t bytes = len * sizeof(char16_t);
    auto* out = static_cast<uint8_t*>(writeInplace(bytes + sizeof(char16_t)));
    if (out == nullptr) return mError != NO_ERROR ? mError : NO_MEMORY;
    memcpy(out, str, bytes);
    memset(out + bytes, 0, sizeof(char16_t));
    return NO_ERROR;
}

status_t Parcel::writeString16(const String16& str) { return writeString16(str.string(), str.size()); }

const char16_t* Parcel::readString16Inplace(size_t* outLen) const {
    int32_t size = readInt32();
    if (size >= 0 && size < INT32_MAX) {
        const void* str = readInplace((static_cast<size_t>(size) + 1) * sizeof(char16_t));
        if (str != nullptr) {
            *outLen = static_cast<size_t>(size);
            return static_cast<const char16_t*>(str);
        }
    }
    *outLen = 0;
    return nullptr;
}

status_t Parcel::readString16(String16* pArg) const {
    size_t len = 0;
    const char16_t* str = readString16Inplace(&len);
    if (str == nullptr) {
        *pArg = String16();
        return UNEXPECTED_NULL;
    }
    pArg->setTo(str, len);
    return NO_ERROR;
}

String16 Parcel::readString16() const {
    String16 result;
    readString16(&result);
    return result;
}

status_t Parcel::writeInterfaceToken(const String16& interface) {
    status_t err = writeInt32(kStrictModePenaltyGather);
    if (err == NO_ERROR) err = writeInt32(kUnsetWorkSource);
    if (err == NO_ERROR) err = writeString16(interface);
    return err;
}

bool Parcel::enforceInterface(const String16& interface, IPCThreadState* /*threadState*/) const {
    readInt32();  // strict-mode policy: no thread state to carry it into
    readInt32();  // work source
    size_t len = 0;
    const char16_t* str = readString16Inplace(&len);
    if (str == nullptr) return false;
    return len == interface.size() && memcmp(str, interface.string(), len * sizeof(char16_t)) == 0;
}

bool Parcel::checkInterface(IBinder* binder) const {
    return binder != nullptr && enforceInterface(binder->getInterfaceDescriptor());
}

// Writes an object record at the position and enters it in the table; a
// record written over an earlier one replaces it there. On failure nothing
// is kept and the caller still holds what it gave.
static status_t writeObjectRecord(Parcel* parcel, binder_size_t** objects, size_t* size,
                                  size_t* capacity, const flat_binder_object& record,
                                  binder_size_t value, ObjectKind kind) {
    // Make room in the table first, so a failure leaves no record behind.
    if (*size == *capacity) {
        const size_t grown = *capacity * 2 + 4;
        auto* table = static_cast<binder_size_t*>(realloc(*objects, grown * kObjectWords * sizeof(binder_size_t)));
        if (table == nullptr) return NO_MEMORY;
        *objects = table;
        *capacity = grown;
    }
    const size_t offset = parcel->dataPosition();
    status_t err = parcel->write(&record, sizeof(record));
    if (err != NO_ERROR) return err;
    for (size_t i = 0; i < *size; ++i) {
        binder_size_t* entry = *objects + i * kObjectWords;
        if (entry[0] == offset) {  // the record was written over
            releaseObject(entry, parcel);
            entry[1] = value;
            entry[2] = kind;
            return NO_ERROR;
        }
    }
    binder_size_t* entry = *objects + *size * kObjectWords;
    entry[0] = offset;
    entry[1] = value;
    entry[2] = kind;
    ++*size;
    return NO_ERROR;
}

status_t Parcel::flattenBinder(const sp<IBinder>& binder) {
    flat_binder_object record{};
    record.type = kTypeBinder;
    // As on a device, a null binder is a record of zeros outside the table.
    if (binder == nullptr) return write(&record, sizeof(record));
    const bool local = binder->localBinder() != nullptr;
    record.type = local ? kTypeBinder : kTypeHandle;
    record.flags = local ? kLocalBinderFlags : 0;
    record.binder = reinterpret_cast<uintptr_t>(binder.get());
    record.cookie = record.binder;
    binder->incStrong(this);
    status_t err = writeObjectRecord(this, &mObjects, &mObjectsSize, &mObjectsCapacity, record,
                                     reinterpret_cast<uintptr_t>(binder.get()), kBinderObject);
    if (err != NO_ERROR) binder->decStrong(this);
    return err;
}

status_t Parcel::unflattenBinder(sp<IBinder>* out) const {
    const size_t offset = mDataPos;
    if (offset > mDataSize || kRecordSize > mDataSize - offset) return BAD_TYPE;
    flat_binder_object record;
    memcpy(&record, mData + offset, sizeof(record));
    mDataPos = offset + kRecordSize;
    for (size_t i = 0; i < mObjectsSize; ++i) {
        const binder_size_t* entry = mObjects + i * kObjectWords;
        if (entry[0] == offset) {
            if (entry[2] != kBinderObject) return BAD_TYPE;
            *out = reinterpret_cast<IBinder*>(entry[1]);
            return NO_ERROR;
        }
    }
    if (record.type == kTypeBinder && record.binder == 0 && record.cookie == 0) {
        *out = nullptr;
        return NO_ERROR;
    }
    return BAD_TYPE;
}

status_t Parcel::writeStrongBinder(const sp<IBinder>& val) { return flattenBinder(val); }

status_t Parcel::readNullableStrongBinder(sp<IBinder>* val) const { return unflattenBinder(val); }

status_t Parcel::readStrongBinder(sp<IBinder>* val) const {
    status_t err = readNullableStrongBinder(val);
    if (err == NO_ERROR && *val == nullptr) err = UNEXPECTED_NULL;
    return err;
}

status_t Parcel::writeFileDescriptor(int fd, bool takeOwnership) {
    if (fd < 0) return BAD_VALUE;
    const int held = takeOwnership ? fd : fcntl(fd, F_DUPFD_CLOEXEC, 0);
    if (held < 0) return -errno;
    flat_binder_object record{};
    record.type = kTypeFd;
    record.flags = kLocalBinderFlags;
    record.binder = static_cast<uint32_t>(held);  // the handle word
    record.cookie = 1;                            // the parcel owns it
    status_t err = writeObjectRecord(this, &mObjects, &mObjectsSize, &mObjectsCapacity, record,
                                     static_cast<binder_size_t>(held), kFdObject);
    if (err != NO_ERROR && !takeOwnership) close(held);
    return err;
}

status_t Parcel::writeDupFileDescriptor(int fd) {
    if (fd < 0) return BAD_VALUE;
    const int dup = fcntl(fd, F_DUPFD_CLOEXEC, 0);
    if (dup < 0) return -errno;
    status_t err = writeFileDescriptor(dup, true);
    if (err != NO_ERROR) close(dup);
    return err;
}

int Parcel::readFileDescriptor() const {
    const size_t offset = mDataPos;
    if (offset > mDataSize || kRecordSize > mDataSize - offset) return BAD_TYPE;
    for (size_t i = 0; i < mObjectsSize; ++i) {
        const binder_size_t* entry = mObjects + i * kObjectWords;
        if (entry[0] == offset && entry[2] == kFdObject) {
            mDataPos = offset + kRecordSize;
            return static_cast<int>(entry[1]);
        }
    }
    return BAD_TYPE;
}

bool Parcel::hasFileDescriptors() const {
    for (size_t i = 0; i < mObjectsSize; ++i) {
        if (mObjects[i * kObjectWords + 2] == kFdObject) return true;
    }
    return false;
}

sp<IBinder> Parcel::readStrongBinder() const {
    sp<IBinder> val;
    readNullableStrongBinder(&val);
    return val;
}

}  // namespace android
