// The host Parcel: layout and alignment, reads at and past the end, strings,
// and binders carried (and kept alive) by a parcel.
#include <binder/Binder.h>
#include <binder/Parcel.h>
#include <gtest/gtest.h>
#include <utils/String8.h>

#include <atomic>
#include <cstring>
#include <vector>

using namespace android;

namespace {

std::vector<uint8_t> bytesOf(const Parcel& p) { return std::vector<uint8_t>(p.data(), p.data() + p.dataSize()); }

class CountedBinder : public BBinder {
public:
    explicit CountedBinder(std::atomic<int>* destroyed) : mDestroyed(destroyed) {}
    ~CountedBinder() override { ++*mDestroyed; }

private:
    std::atomic<int>* mDestroyed;
};

}  // namespace

TEST(Parcel, IntegersAreLittleEndianWordsReadBackInOrder) {
    Parcel p;
    p.writeInt32(-2);
    p.writeUint32(0xA1B2C3D4u);
    p.writeInt64(0x0102030405060708LL);
    const std::vector<uint8_t> expected = {0xFE, 0xFF, 0xFF, 0xFF, 0xD4, 0xC3, 0xB2, 0xA1,
                                           0x08, 0x07, 0x06, 0x05, 0x04, 0x03, 0x02, 0x01};
    EXPECT_EQ(expected, bytesOf(p));
    EXPECT_EQ(16u, p.dataPosition());

    p.setDataPosition(0);
    EXPECT_EQ(16u, p.dataAvail());
    EXPECT_EQ(-2, p.readInt32());
    EXPECT_EQ(0xA1B2C3D4u, p.readUint32());
    int64_t l = 0;
    EXPECT_EQ(NO_ERROR, p.readInt64(&l));
    EXPECT_EQ(0x0102030405060708LL, l);
    EXPECT_EQ(0u, p.dataAvail());
}

TEST(Parcel, ReadsPastTheEndGiveZeroOrNotEnoughDataAndDoNotMove) {
    Parcel p;
    EXPECT_EQ(0, p.readInt32());
    p.writeInt32(5);
    p.setDataPosition(0);
    EXPECT_EQ(5, p.readInt32());
    int32_t value = 77;
    EXPECT_EQ(NOT_ENOUGH_DATA, p.readInt32(&value));
    EXPECT_EQ(77, value);
    EXPECT_EQ(0, p.readInt32());
    EXPECT_EQ(4u, p.dataPosition());

    p.setDataPosition(0);  // a 64-bit read needs all eight bytes
    int64_t wide = 9;
    EXPECT_EQ(NOT_ENOUGH_DATA, p.readInt64(&wide));
    EXPECT_EQ(9, wide);
    EXPECT_EQ(0u, p.dataPosition());

    p.setDataPosition(100);
    EXPECT_EQ(0u, p.dataAvail());
    EXPECT_EQ(NOT_ENOUGH_DATA, p.readInt32(&value));
    EXPECT_EQ(nullptr, p.readCString());
    EXPECT_EQ(nullptr, p.readInplace(4));
}

TEST(Parcel, SetDataCopiesBytesAndTruncatedDataStopsReads) {
    Parcel source;
    source.writeInt32(11);
    source.writeInt32(22);
    Parcel copy;
    copy.writeInt32(99);  // replaced, not appended to
    ASSERT_EQ(NO_ERROR, copy.setData(source.data(), 6));
    EXPECT_EQ(6u, copy.dataSize());
    EXPECT_EQ(0u, copy.dataPosition());
    source.setDataPosition(0);
    source.writeInt32(33);  // the copy owns its bytes
    EXPECT_EQ(11, copy.readInt32());
    int32_t value = -1;
    EXPECT_EQ(NOT_ENOUGH_DATA, copy.readInt32(&value));
    EXPECT_EQ(-1, value);
    EXPECT_EQ(2u, copy.dataAvail());
    EXPECT_EQ(BAD_VALUE, copy.setData(nullptr, 4));
}

TEST(Parcel, ShrinkingGrowingAndJumpingPastTheEndLeaveZeros) {
    Parcel p;
    for (int32_t v : {1, 2, 3}) p.writeInt32(v);
    ASSERT_EQ(NO_ERROR, p.setDataSize(4));
    EXPECT_EQ(4u, p.dataPosition());
    ASSERT_EQ(NO_ERROR, p.setDataSize(8));
    p.setDataPosition(16);
    p.writeInt32(7);
    EXPECT_EQ(20u, p.dataSize());
    p.setDataPosition(0);
    for (int32_t v : {1, 0, 0, 0, 7}) EXPECT_EQ(v, p.readInt32());  // not the old 2 and 3
    p.freeData();
    EXPECT_EQ(0u, p.dataSize());
    EXPECT_EQ(0u, p.dataPosition());
}

TEST(Parcel, CStringsArePaddedWithZerosToWholeWords) {
    Parcel p;
    p.writeCString("abc");  // 3 + NUL: one word
    p.writeCString("hello");  // 5 + NUL: two words
    p.writeCString("");
    p.writeInt32(9);
    EXPECT_EQ(20u, p.dataSize());
    const std::vector<uint8_t> hello = {'h', 'e', 'l', 'l', 'o', 0, 0, 0};
    EXPECT_EQ(0, memcmp(hello.data(), p.data() + 4, hello.size()));
    p.setDataPosition(0);
    EXPECT_STREQ("abc", p.readCString());
    EXPECT_STREQ("hello", p.readCString());
    EXPECT_EQ(12u, p.dataPosition());
    EXPECT_STREQ("", p.readCString());
    EXPECT_EQ(9, p.readInt32());
    EXPECT_EQ(BAD_VALUE, p.writeCString(nullptr));

    // Padding is zeroed even over bytes written before.
    Parcel over;
    over.writeInt32(-1);
    over.writeInt32(-1);
    over.setDataPosition(0);
    over.writeCString("hello");
    EXPECT_EQ(0, memcmp(hello.data(), over.data(), hello.size()));
}

TEST(Parcel, CStringWithoutTerminatorInTheDataIsNull) {
    const char unterminated[] = {'a', 'b', 'c', 'd', 'e', 'f', 'g', 'h'};
    Parcel p;
    p.setData(reinterpret_cast<const uint8_t*>(unterminated), sizeof(unterminated));
    EXPECT_EQ(nullptr, p.readCString());
    EXPECT_EQ(0u, p.dataPosition());
    // The terminator may be the last byte of unpadded data.
    const char shortString[] = {'x', 'y', 0};
    p.setData(reinterpret_cast<const uint8_t*>(shortString), sizeof(shortString));
    EXPECT_STREQ("xy", p.readCString());
    EXPECT_EQ(0u, p.dataAvail());
    EXPECT_EQ(0, p.readInt32());
}

TEST(Parcel, String8AndString16RoundTripWithTheirLengthPrefixes) {
    Parcel p;
    p.writeString8(String8("quell"));  // length, then 5 chars + NUL padded
    p.writeString8(String8());  // the length alone
    p.writeString16(String16("born"));  // length, then 4 UTF-16 chars + NUL padded
    EXPECT_EQ(12u + 4u + 16u, p.dataSize());
    p.writeString16(nullptr, 0);
    p.writeInt32(3);

    p.setDataPosition(0);
    EXPECT_EQ(String8("quell"), p.readString8());
    String8 empty("x");
    EXPECT_EQ(NO_ERROR, p.readString8(&empty));
    EXPECT_EQ(0u, empty.length());
    EXPECT_EQ(String16("born"), p.readString16());
    String16 missing("y");
    EXPECT_EQ(UNEXPECTED_NULL, p.readString16(&missing));
    EXPECT_EQ(0u, missing.size());
    EXPECT_EQ(3, p.readInt32());

    Parcel truncated;  // a length that runs past the data
    truncated.writeInt32(100);
    truncated.writeInt32(0x41414141);
    truncated.setDataPosition(0);
    String8 s8;
    EXPECT_EQ(BAD_VALUE, truncated.readString8(&s8));
}

TEST(Parcel, InterfaceTokenIsEnforcedByName) {
    Parcel p;
    p.writeInterfaceToken(String16("android.test.IFoo"));
    p.writeInt32(5);
    p.setDataPosition(0);
    EXPECT_TRUE(p.enforceInterface(String16("android.test.IFoo")));
    EXPECT_EQ(5, p.readInt32());
    p.setDataPosition(0);
    EXPECT_FALSE(p.enforceInterface(String16("android.test.IBar")));
}

TEST(Parcel, StrongBinderRoundTripsAndIsKeptAliveByTheParcel) {
    std::atomic<int> destroyed{0};
    wp<IBinder> weak;
    {
        Parcel p;
        p.writeInt32(1);
        {
            sp<IBinder> binder = new CountedBinder(&destroyed);
            weak = binder;
            EXPECT_EQ(NO_ERROR, p.writeStrongBinder(binder));
        }
        EXPECT_EQ(0, destroyed.load());
        EXPECT_EQ(1u, p.objectsCount());
        EXPECT_EQ(4u + 24u, p.dataSize());
        p.writeInt32(2);

        p.setDataPosition(0);
        EXPECT_EQ(1, p.readInt32());
        sp<IBinder> read;
        EXPECT_EQ(NO_ERROR, p.readStrongBinder(&read));
        EXPECT_EQ(weak.promote(), read);
        EXPECT_EQ(2, p.readInt32());
        read.clear();
        EXPECT_EQ(0, destroyed.load());
    }
    EXPECT_EQ(1, destroyed.load());
}

TEST(Parcel, FreeingOrCuttingTheDataReleasesItsBinders) {
    std::atomic<int> destroyed{0};
    Parcel p;
    p.writeStrongBinder(new CountedBinder(&destroyed));
    p.writeStrongBinder(new CountedBinder(&destroyed));
    ASSERT_EQ(NO_ERROR, p.setDataSize(24));
    EXPECT_EQ(1u, p.objectsCount());
    EXPECT_EQ(1, destroyed.load());
    p.freeData();
    EXPECT_EQ(0u, p.objectsCount());
    EXPECT_EQ(2, destroyed.load());
    p.writeStrongBinder(new CountedBinder(&destroyed));
    p.setData(nullptr, 0);
    EXPECT_EQ(3, destroyed.load());
}

TEST(Parcel, NullBinderIsARecordOutsideTheObjectTable) {
    Parcel p;
    EXPECT_EQ(NO_ERROR, p.writeStrongBinder(nullptr));
    EXPECT_EQ(24u, p.dataSize());
    EXPECT_EQ(0u, p.objectsCount());
    p.setDataPosition(0);
    sp<IBinder> out = new BBinder();
    EXPECT_EQ(UNEXPECTED_NULL, p.readStrongBinder(&out));
    EXPECT_EQ(nullptr, out);
    p.setDataPosition(0);
    out = new BBinder();
    EXPECT_EQ(NO_ERROR, p.readNullableStrongBinder(&out));
    EXPECT_EQ(nullptr, out);
}

TEST(Parcel, CopiedBytesCarryNoBinderAndBinderRecordsAreNotReadAsIntegers) {
    Parcel p;
    p.writeStrongBinder(new BBinder());
    Parcel copy;
    copy.setData(p.data(), p.dataSize());
    EXPECT_EQ(0u, copy.objectsCount());
    sp<IBinder> out;
    EXPECT_EQ(BAD_TYPE, copy.readStrongBinder(&out));
    EXPECT_EQ(nullptr, out);

    p.setDataPosition(0);
    int32_t word = 0;
    EXPECT_EQ(BAD_VALUE, p.readInt32(&word));
    EXPECT_EQ(nullptr, p.readInplace(8));
    Parcel empty;
    EXPECT_EQ(nullptr, empty.readStrongBinder());
}
