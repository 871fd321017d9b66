// System properties, as the daemon asks for most of them.
#pragma once

namespace corvexd {

// Whether the property reads exactly `wanted` at this moment; unset or empty, it reads
// `default_value`. Any thread.
bool property_is(const char* name, const char* wanted, const char* default_value = "");

}  // namespace corvexd
