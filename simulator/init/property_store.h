// The device's system properties: one file each, the lasting ones also in the data partition.
#pragma once

#include <string>

namespace corvexd::sim {

// Makes the property directory with the properties of a device that has just started: the fixed
// ones, and over them those with a "persist." name that were set before.
void load_properties();

// Stores a property so that a reader sees its old value or its new one. False when the name or the
// value is none that a property may have, or the files cannot be written.
bool store_property(const std::string& key, const std::string& value);

}  // namespace corvexd::sim
