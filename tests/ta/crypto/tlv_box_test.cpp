// SPDX-License-Identifier: BSD-2-Clause
// Which bytes are a box is held by the fuzz target and its corpus.
#include "crypto/tlv_box.h"

#include <vector>

#include "support/inside_agent.h"

namespace otrp_test {
namespace {

class TlvBox : public InsideAgent {};
using Bytes = std::vector<uint8_t>;

box_ptr parse(const Bytes &bytes) {
  return box_ptr(tlv_box_parse(bytes.data(), static_cast<uint32_t>(bytes.size())));
}

Bytes serialized(const tlv_box *box) {
  const uint8_t *bytes = tlv_box_get_buffer(box);
  return Bytes(bytes, bytes + tlv_box_get_size(box));
}

int put(const box_ptr &box, uint16_t type, const Bytes &value) {
  return tlv_box_put_bytes(box.get(), type, value.data(), static_cast<uint32_t>(value.size()));
}

TEST_F(TlvBox, SerializesTheNewestRecordFirstAndCloses) {
  const box_ptr box(tlv_box_create());
  EXPECT_EQ(tlv_box_get_buffer(box.get()), nullptr);
  EXPECT_EQ(tlv_box_put_int(box.get(), 0x10, 2048), 0);
  EXPECT_EQ(put(box, 0x11, {0xAA, 0xBB}), 0);
  EXPECT_EQ(put(box, 0x1234, {}), 0);
  EXPECT_EQ(put(box, 0x11, {0xCC}), TLV_ERROR);
  EXPECT_EQ(put(box, 0x12, Bytes(65536)), TLV_ERROR);  // longer than its length can say
  EXPECT_EQ(tlv_box_get_size(box.get()), 18u);
  EXPECT_EQ(tlv_box_serialize(box.get()), 0);
  const Bytes expected = {0x34, 0x12, 0, 0, 0x11, 0, 2, 0, 0xAA, 0xBB, 0x10, 0, 4, 0, 0, 8, 0, 0};
  EXPECT_EQ(tlv_box_serialize(box.get()), TLV_SERIALIZED);
  EXPECT_EQ(put(box, 0x20, {1}), TLV_SERIALIZED);
  EXPECT_EQ(serialized(box.get()), expected);
  EXPECT_EQ(serialized(parse(expected).get()), expected);
  EXPECT_EQ(put(parse(expected), 0x20, {1}), TLV_SERIALIZED);
}

TEST_F(TlvBox, TakesNothingMoreOnceItIsClosed) {
  const box_ptr parsed = parse({1, 0, 1, 0, 9});
  const box_ptr serialized(tlv_box_create());
  ASSERT_EQ(tlv_box_serialize(serialized.get()), 0);
  for (tlv_box *box : {parsed.get(), serialized.get()}) {
    EXPECT_EQ(tlv_box_putobject(box, 2, "value", 5), TLV_SERIALIZED);
  }
}

TEST_F(TlvBox, LookupsThatFailLeaveTheirOutputsAlone) {
  EXPECT_EQ(tlv_box_parse(nullptr, 4), nullptr);
  const box_ptr box = parse({0x11, 0, 3, 0, 7, 8, 9});
  uint32_t number = 5;
  EXPECT_EQ(tlv_box_get_int(box.get(), 0x11, &number), TLV_ERROR);  // too short for one
  EXPECT_EQ(tlv_box_get_int(box.get(), 0x12, &number), TLV_ERROR);
  EXPECT_EQ(number, 5u);
  Bytes bytes(5, 0xEE);
  uint32_t len = 2;
  EXPECT_EQ(tlv_box_get_bytes(box.get(), 0x11, bytes.data(), &len), TLV_ERROR);
  EXPECT_EQ(tlv_box_get_bytes(box.get(), 0x12, bytes.data(), &len), TLV_ERROR);
  EXPECT_EQ(bytes, Bytes(5, 0xEE));
  const uint8_t *own = nullptr;
  EXPECT_EQ(tlv_box_get_bytes_ptr(box.get(), 0x12, &own, &len), TLV_NOT_FOUND);
}

}  // namespace
}  // namespace otrp_test
