// The table of the daemon's own readers.
#include <stdlib.h>

#include "capture/node_reader.h"
#include "capture/recorders.h"
#include "core/settings.h"
#include "storage/capture_paths.h"

namespace corvexd {
namespace {

constexpr int64_t kKibibyte = 1024;
constexpr int64_t kFirmwareLogSize = 20 * kKibibyte * kKibibyte;
constexpr int kPreBootloaderBlocks = 32;

int64_t kernel_log_size() { return strtoll(kernel_logsize, nullptr, 10) * kKibibyte; }
int64_t firmware_log_size() { return kFirmwareLogSize; }

}  // namespace

const NodeReader kKernelReader = {
    /*name=*/"kernel",
    /*node_name=*/"Kernel",
    /*source=*/"/dev/kmsg",
    /*output=*/&kernel_log_path,
    /*from_fd=*/&kernel_from_fd,
    /*to_fd=*/&kernel_to_fd,
    /*at_end=*/AtEnd::kReadAgain,
    /*logs_end=*/true,
    /*max_reads=*/0,
    /*erases_source=*/false,
    /*rotation_size=*/kernel_log_size,
    /*is_kernel_log=*/true,
};

const NodeReader kQseeReader = {
    /*name=*/"qsee",
    /*node_name=*/"qsee",
    /*source=*/"/proc/tzdbg/qsee_log",
    /*output=*/&qsee_log_path,
    /*from_fd=*/&qsee_from_fd,
    /*to_fd=*/&qsee_to_fd,
    /*at_end=*/AtEnd::kReadAgain,
    /*logs_end=*/false,
    /*max_reads=*/0,
    /*erases_source=*/false,
    /*rotation_size=*/firmware_log_size,
    /*is_kernel_log=*/false,
};

const NodeReader kTzReader = {
    /*name=*/"tz",
    /*node_name=*/"tz",
    /*source=*/"/proc/tzdbg/tz_log",
    /*output=*/&tz_log_path,
    /*from_fd=*/&tz_from_fd,
    /*to_fd=*/&tz_to_fd,
    /*at_end=*/AtEnd::kReadAgain,
    /*logs_end=*/false,
    /*max_reads=*/0,
    /*erases_source=*/false,
    /*rotation_size=*/firmware_log_size,
    /*is_kernel_log=*/false,
};

const NodeReader kBootloaderReader = {
    /*name=*/"bootloader",
    /*node_name=*/"bootloader",
    /*source=*/"/proc/bootloader_log",
    /*output=*/&bootloader_log_path,
    /*from_fd=*/&bootloader_from_fd,
    /*to_fd=*/&bootloader_to_fd,
    /*at_end=*/AtEnd::kStop,
    /*logs_end=*/true,
    /*max_reads=*/0,
    /*erases_source=*/false,
    /*rotation_size=*/nullptr,
    /*is_kernel_log=*/false,
};

const NodeReader kPreBootloaderReader = {
    /*name=*/"pre_bootloader",
    /*node_name=*/"pre_bootloader",
    /*source=*/"/dev/block/platform/soc/624000.ufshc/by-name/reserve1",
    /*output=*/&pre_bootloader_log_path,
    /*from_fd=*/&pre_bootloader_from_fd,
    /*to_fd=*/&pre_bootloader_to_fd,
    /*at_end=*/AtEnd::kStop,
    /*logs_end=*/true,
    /*max_reads=*/kPreBootloaderBlocks,
    /*erases_source=*/true,
    /*rotation_size=*/nullptr,
    /*is_kernel_log=*/false,
};

}  // namespace corvexd
