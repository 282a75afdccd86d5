// SPDX-License-Identifier: BSD-2-Clause
// The image header of a trusted application, from the ta_config.h of its build.
#include <ta_config.h>
#include <tee_ta_image.h>

namespace {

const tee_property kProperties[] = {
    {"gpd.ta.singleInstance", TEE_PROPERTY_BOOL, {.boolean = TA_SINGLE_INSTANCE}},
    {"gpd.ta.multiSession", TEE_PROPERTY_BOOL, {.boolean = TA_MULTI_SESSION}},
    {"gpd.ta.instanceKeepAlive", TEE_PROPERTY_BOOL, {.boolean = TA_INSTANCE_KEEP_ALIVE}},
    {"gpd.ta.dataSize", TEE_PROPERTY_U32, {.u32 = TA_DATA_SIZE}},
    {"gpd.ta.stackSize", TEE_PROPERTY_U32, {.u32 = TA_STACK_SIZE}},
    {"gpd.ta.version", TEE_PROPERTY_STRING, {.string = TA_VERSION}},
    {"gpd.ta.description", TEE_PROPERTY_STRING, {.string = TA_DESCRIPTION}},
};

const tee_ta_metadata kMetadata = {
    .trace_level = TA_TRACE_LEVEL,
    .reserved = {2, 1},
    .signature_header_mode = TA_SIGNATURE_HEADER_MODE,
    .trace_prefix = TA_TRACE_PREFIX,
    .num_properties = sizeof(kProperties) / sizeof(kProperties[0]),
    .properties = kProperties,
};

}  // namespace

extern "C" const tee_ta_image TA_EXPORT tee_ta_image;
const struct tee_ta_image tee_ta_image = {
    .magic = TEE_TA_IMAGE_MAGIC,
    .version = TEE_TA_IMAGE_VERSION,
    .uuid = TA_UUID,
    .stack_size = TA_STACK_SIZE,
    .flags = TA_HEADER_FLAGS,
    .metadata = &kMetadata,
    .entry_points = {TA_CreateEntryPoint, TA_DestroyEntryPoint, TA_OpenSessionEntryPoint,
                     TA_CloseSessionEntryPoint, TA_InvokeCommandEntryPoint},
};
