#include <gtest/gtest.h>

#include <lumicor/zbm_image.h>

#include "common/src/internal/byte_cursor.h"

namespace {

TEST(ByteOrderTest, BigEndianWritersReverseAndAreTheirOwnInverse) {
    const uint32_t v = 0x11223344u;
    uint8_t out[4];
    EXPECT_EQ(zbm_Write32BE(out, &v), 4u);
    EXPECT_EQ(out[0], 0x11);
    EXPECT_EQ(out[3], 0x44);
    uint32_t back = 0;
    zbm_Write32BE(&back, out);
    EXPECT_EQ(back, v);

    const uint64_t w = 0x0102030405060708ull;
    uint8_t o8[8];
    EXPECT_EQ(zbm_Write64BE(o8, &w), 8u);
    EXPECT_EQ(o8[0], 0x01);
    EXPECT_EQ(o8[7], 0x08);
}

TEST(ByteOrderTest, DispatchByEndianType) {
    const uint16_t v = 0xABCD;
    uint8_t out[2] = {0, 0};
    EXPECT_EQ(zbm_Write16(out, &v, ZBM_WRITE_ENDIAN_LITTLE), 2u);
    EXPECT_EQ(out[0], 0xCD);
    EXPECT_EQ(zbm_Write16(out, &v, ZBM_WRITE_ENDIAN_BIG), 2u);
    EXPECT_EQ(out[0], 0xAB);
    out[0] = out[1] = 0x55;
    EXPECT_EQ(zbm_Write16(out, &v, ZBM_WRITE_ENDIAN_NONE), 0u);
    EXPECT_EQ(out[0], 0x55);
    EXPECT_EQ(zbm_Write32(out, &v, static_cast<_zbm_WriteEndianType>(7)), 0u);
}

TEST(ByteOrderTest, ReaderStopsAtTheEnd) {
    const uint8_t data[6] = {0, 0, 1, 2, 0xFF, 0xFE};
    lmk::ByteReader r(data, sizeof data);
    EXPECT_EQ(r.U32(), 0x102u);
    EXPECT_EQ(r.U32(), 0u);  // only two bytes left
    EXPECT_FALSE(r.ok());
    EXPECT_EQ(r.U8(), 0u);   // stays failed
    lmk::ByteReader empty(nullptr, 100);
    EXPECT_EQ(empty.remaining(), 0u);
    EXPECT_FALSE(empty.Skip(1));
}

TEST(ByteOrderTest, WriterNeverRunsPastItsSize) {
    uint8_t buf[6] = {9, 9, 9, 9, 9, 9};
    lmk::ByteWriter w(buf, 5);
    EXPECT_TRUE(w.U32(0xA1B2C3D4u));
    EXPECT_FALSE(w.U16(0x1234));
    EXPECT_FALSE(w.ok());
    EXPECT_EQ(buf[0], 0xA1);
    EXPECT_EQ(buf[4], 9);
    EXPECT_EQ(buf[5], 9);
}

}  // namespace
