// The host Parcel: layout and alignment, reads at and past the end, strings,
// and binders and file descriptors carried (and kept alive) by a parcel.
#include <binder/Binder.h>
#include <binder/Parcel.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <cstring>
#include <vector>

using namespace android;

namespace {

void setBytes(Parcel* p, const std::vector<char>& bytes) {
    p->setData(reinterpret_cast<const uint8_t*>(bytes.data()), bytes.size());
}

}  // namespace

TEST(Parcel, IntegersAreLittleEndianWordsAndReadsPastTheEndDoNotMove) {
    Parcel p;
    p.writeInt32(-2);
    p.writeUint32(0xA1B2C3D4u);
    p.writeInt64(0x0102030405060708LL);
    EXPECT_EQ((std::vector<uint8_t>{0xFE, 0xFF, 0xFF, 0xFF, 0xD4, 0xC3, 0xB2, 0xA1, 8, 7, 6, 5, 4, 3, 2, 1}),
              std::vector<uint8_t>(p.data(), p.data() + p.dataSize()));
    p.setDataPosition(0);
    EXPECT_EQ(-2, p.readInt32());
    EXPECT_EQ(0xA1B2C3D4u, p.readUint32());
    EXPECT_EQ(0x0102030405060708LL, p.readInt64());
    EXPECT_EQ(0, p.readInt32());  // past the end: zero, or NOT_ENOUGH_DATA and the value left alone
    int32_t value = 77;
    EXPECT_EQ(NOT_ENOUGH_DATA, p.readInt32(&value));
    EXPECT_EQ(77, value);
    EXPECT_EQ(16u, p.dataPosition());

    p.setDataPosition(12);  // a 64-bit read needs all eight bytes
    int64_t wide = 9;
    EXPECT_EQ(NOT_ENOUGH_DATA, p.readInt64(&wide));
    EXPECT_EQ(9, wide);
    EXPECT_EQ(12u, p.dataPosition());

    p.setDataPosition(100);
    EXPECT_EQ(0u, p.dataAvail());
    EXPECT_EQ(NOT_ENOUGH_DATA, p.readInt32(&value));
    EXPECT_EQ(nullptr, p.readCString());
    EXPECT_EQ(nullptr, p.readInplace(4));
}

TEST(Parcel, CStringsArePaddedWithZerosToWholeWordsAndNeedATerminator) {
    Parcel p;
    p.writeCString("abc");  // 3 + NUL: one word
    p.writeCString("hello");  // 5 + NUL: two words
    p.writeCString("");
    p.writeInt32(9);
    EXPECT_EQ(20u, p.dataSize());
    const char hello[] = {'h', 'e', 'l', 'l', 'o', 0, 0, 0};
    EXPECT_EQ(0, memcmp(hello, p.data() + 4, sizeof(hello)));
    p.setDataPosition(0);
    for (const char* s : {"abc", "hello", ""}) EXPECT_STREQ(s, p.readCString());
    EXPECT_EQ(9, p.readInt32());
    EXPECT_EQ(BAD_VALUE, p.writeCString(nullptr));

    setBytes(&p, {'a', 'b', 'c', 'd', 'e', 'f', 'g', 'h'});
    EXPECT_EQ(nullptr, p.readCString());
    EXPECT_EQ(0u, p.dataPosition());
    setBytes(&p, {'x', 'y', 0});  // the terminator may be the last byte of unpadded data
    EXPECT_STREQ("xy", p.readCString());
    EXPECT_EQ(0u, p.dataAvail());
}

TEST(Parcel, ANullBinderIsARecordThatReadsAsNull) {
    Parcel p;  // a null binder is a record outside the object table
    EXPECT_EQ(NO_ERROR, p.writeStrongBinder(nullptr));
    EXPECT_EQ(24u, p.dataSize());
    p.setDataPosition(0);
    sp<IBinder> out = new BBinder();
    EXPECT_EQ(UNEXPECTED_NULL, p.readStrongBinder(&out));
    EXPECT_EQ(nullptr, out);
    EXPECT_EQ(nullptr, Parcel().readStrongBinder());
}

// A descriptor arrives as the driver delivers it: a duplicate of the
// sender's that the parcel owns and closes, never the sender's own.
TEST(Parcel, FileDescriptorsArriveAsDuplicatesThatLiveAsLongAsTheParcel) {
    int pipeFds[2];
    ASSERT_EQ(0, pipe(pipeFds));
    int carried = -1;
    {
        Parcel p;
        EXPECT_EQ(BAD_VALUE, p.writeFileDescriptor(-1));
        ASSERT_EQ(NO_ERROR, p.writeFileDescriptor(pipeFds[1]));
        ASSERT_EQ(NO_ERROR, p.writeDupFileDescriptor(pipeFds[1]));
        p.writeStrongBinder(new BBinder());
        EXPECT_TRUE(p.hasFileDescriptors());
        EXPECT_EQ(3u, p.objectsCount());
        p.setDataPosition(0);
        carried = p.readFileDescriptor();
        ASSERT_GE(carried, 0);
        EXPECT_NE(pipeFds[1], carried);
        EXPECT_GE(p.readFileDescriptor(), 0);
        EXPECT_EQ(BAD_TYPE, p.readFileDescriptor());  // a binder is not a descriptor
        ASSERT_EQ(1, write(carried, "x", 1));
        char byte = 0;
        ASSERT_EQ(1, read(pipeFds[0], &byte, 1));
        EXPECT_EQ('x', byte);

        Parcel copy;  // bytes copied out carry no descriptor
        copy.setData(p.data(), p.dataSize());
        EXPECT_FALSE(copy.hasFileDescriptors());
        EXPECT_EQ(BAD_TYPE, copy.readFileDescriptor());
    }
    EXPECT_EQ(-1, fcntl(carried, F_GETFD));  // closed with the parcel
    EXPECT_EQ(1, write(pipeFds[1], "y", 1));  // the sender's stays open
    close(pipeFds[0]);
    close(pipeFds[1]);
}
