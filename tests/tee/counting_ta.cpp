// SPDX-License-Identifier: BSD-2-Clause
// The image of a trusted application that counts its commands, in variables of both kinds.
#include <tee_ta_image.h>

namespace {

uint32_t count;
uint32_t step = 1;

TEE_Result invoke(void *, uint32_t, uint32_t, TEE_Param params[4]) {
  count += step;
  step = 100;
  params[0].value.a = count;
  return TEE_SUCCESS;
}

const tee_property kProperties[] = {
    {"gpd.ta.singleInstance", TEE_PROPERTY_BOOL, {.boolean = true}},
    {"gpd.ta.multiSession", TEE_PROPERTY_BOOL, {.boolean = true}},
    {"gpd.ta.instanceKeepAlive", TEE_PROPERTY_BOOL, {.boolean = false}},
    {"gpd.ta.dataSize", TEE_PROPERTY_U32, {.u32 = 4096}},
};
const tee_ta_metadata kMetadata = {.trace_level = 0,
                                   .reserved = {2, 1},
                                   .signature_header_mode = 0,
                                   .trace_prefix = "counting",
                                   .num_properties = 4,
                                   .properties = kProperties};

}  // namespace

extern "C" __attribute__((visibility("default"))) const struct tee_ta_image tee_ta_image = {
    .magic = TEE_TA_IMAGE_MAGIC,
    .version = TEE_TA_IMAGE_VERSION,
    .uuid = {1, 0, 0x4000, {0x80, 0, 0, 0, 0, 0, 0, 0xA}},
    .stack_size = 4096,
    .flags = 0,
    .metadata = &kMetadata,
    .entry_points = {[] { return TEE_SUCCESS; }, [] {},
                     [](uint32_t, TEE_Param *, void **) { return TEE_SUCCESS; }, [](void *) {},
                     invoke},
};
