// The steps of start-up, from power-on to serving.
#pragma once

namespace corvexd {

// "/kv2/" where it can be read, else "/cache/".
void choose_cache_directory();

// Whether the fstab forces encryption of the data partition.
bool data_is_force_encrypted();

// Wait, without limit, until installd has laid out the data partition, and until the partition can
// be used: after the framework's restart when it is force-encrypted, else when internal storage is
// mounted.
void wait_for_layout();
void wait_for_data_partition(bool force_encrypted);

// Starts a capture at once when persistent capture is on; asks init for the diagnostic logging
// service when that is.
void start_persistent_capture();
void start_diagnostic_service();

}  // namespace corvexd
