// The boot configuration: values that the bootloader passes to the system, by key.
#pragma once

#include <string>

// Sets *out_val to the value of `key` and returns true when the property "ro.boot.<key>", the
// kernel command line or the device tree, asked in this order, holds one. *out_val may have been
// changed when the answer is false. A null out_val ends the process. Any thread.
bool fs_mgr_get_boot_config(const std::string& key, std::string* out_val);

// The same from the kernel command line alone; *out_val is left as it was when it holds no value.
bool fs_mgr_get_boot_config_from_kernel_cmdline(const std::string& key, std::string* out_val);

// The suffix of partitions that exist once for each slot, for example "_a"; empty when the device
// has no slots.
std::string fs_mgr_get_slot_suffix();

// The value of the entry "androidboot.<key>" of a command line, when it holds one.
bool find_in_command_line(const std::string& command_line, const std::string& key,
                          std::string* out_val);

// The device tree's Android directory (found out at the first call, then kept), whether it is
// marked as ours, and one of its files without its last byte, the NUL that ends a device-tree text.
const std::string& get_android_dt_dir();
bool is_dt_compatible();
bool read_dt_file(const std::string& file, std::string* out);
