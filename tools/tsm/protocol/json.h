// SPDX-License-Identifier: BSD-2-Clause
/// JSON as the device reads and writes it.
///
/// Members keep their order. The device writes control characters inside strings as they are, so
/// the parser here takes them too.
#ifndef TSM_PROTOCOL_JSON_H
#define TSM_PROTOCOL_JSON_H

#include <nlohmann/json.hpp>
#include <optional>
#include <string>
#include <string_view>

namespace tsm {

using Json = nlohmann::ordered_json;

/// Nothing when the text is not JSON, not UTF-8, nested deeper than any message or followed by
/// anything but white space.
std::optional<Json> parse_json(std::string_view text);

/// Why parse_json() gives nothing for `text`; empty when it gives something.
std::string json_problem(std::string_view text);

/// The compact text that the device makes of the same document, to the byte: eight characters are
/// escaped (the slash among them), all others stand as they are; numbers are plain.
std::string serialize_as_device(const Json &value);

/// The text that dump() makes, sooner. Throws as that does, Json::type_error, for what is not
/// UTF-8.
std::string compact(const Json &value);

/// The object, array or string member `name`; NULL when `value` is no object or has none such.
const Json *find_object(const Json &value, std::string_view name);
const Json *find_array(const Json &value, std::string_view name);
const std::string *find_string(const Json &value, std::string_view name);

}  // namespace tsm

/// Compiled once, in json.cpp, and not in each source that reads JSON.
extern template class nlohmann::basic_json<nlohmann::ordered_map>;

#endif
