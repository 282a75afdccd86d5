// SPDX-License-Identifier: BSD-2-Clause
// What a kit is told of the agent is what its own image says to the host TEE.
#include <dlfcn.h>
#include <gtest/gtest.h>
#include <tee_ta_image.h>

#include <nlohmann/json.hpp>

#include "common/files.h"

namespace {

using nlohmann::json;

json value_of(const tee_property &property) {
  switch (property.type) {
    case TEE_PROPERTY_BOOL:
      return property.value.boolean;
    case TEE_PROPERTY_U32:
      return property.value.u32;
    default:
      return property.value.string;
  }
}

TEST(Description, SaysWhatTheImageSays) {
  void *handle = dlopen(OTRP_AGENT_IMAGE, RTLD_NOW | RTLD_LOCAL);
  ASSERT_NE(handle, nullptr) << dlerror();
  const auto *image = static_cast<const tee_ta_image *>(dlsym(handle, TEE_TA_IMAGE_SYMBOL));
  ASSERT_NE(image, nullptr);
  const tee_ta_metadata &metadata = *image->metadata;
  json properties = json::object();
  for (uint32_t i = 0; i < metadata.num_properties; ++i) {
    properties[metadata.properties[i].name] = value_of(metadata.properties[i]);
  }

  const json description = json::parse(tools::read_file(OTRP_AGENT_DESCRIPTION));
  char uuid_start[sizeof("00000000-0000-0000-")];
  snprintf(uuid_start, sizeof(uuid_start), "%08x-%04x-%04x-", image->uuid.timeLow,
           image->uuid.timeMid, image->uuid.timeHiAndVersion);
  EXPECT_TRUE(description["uuid"].get<std::string>().starts_with(uuid_start));
  EXPECT_EQ(description["flags"], image->flags);
  EXPECT_EQ(description["stack_size"], image->stack_size);
  EXPECT_EQ(description["trace_level"], metadata.trace_level);
  EXPECT_EQ(description["trace_prefix"], metadata.trace_prefix);
  EXPECT_EQ(description["signature_header_mode"], metadata.signature_header_mode);
  EXPECT_EQ(description["properties"], properties);
  dlclose(handle);
}

}  // namespace
