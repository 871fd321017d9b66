// The table of the daemon's own readers.
#include <stdlib.h>

#include "capture/capture_state.h"
#include "capture/node_reader.h"
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
    "/dev/kmsg",
    &kernel_log_path,
    &kernel_from_fd,
    &kernel_to_fd,
    /*needs_readable_source=*/true,
    AtEnd::kReadAgain,
    /*max_reads=*/0,
    /*erases_source=*/false,
    kernel_log_size,
    /*owns_rotated_files=*/true,
    /*appends_when_reopened=*/true,
    {
        "corvexd: Kernel log node can not be read: %s \n",
        "corvexd: Open %s Error：%s\n",
        "corvexd: Open %s Error %s\n",
        "corvexd: bytes_read is -1, read kernel log fail! Error: %s \n",
        "corvexd: eof, kernel log process continue \n",
        nullptr,
        "corvexd: Kernel log node can not access: %s, errno: %d, %s\n",
        "corvexd: bytes_write is -1, write kernel log fail! Error: %s \n",
        "total kernel bytes write %lld,offset %d",
    },
};

const NodeReader kQseeReader = {
    "/proc/tzdbg/qsee_log",
    &qsee_log_path,
    &qsee_from_fd,
    &qsee_to_fd,
    /*needs_readable_source=*/false,
    AtEnd::kReadAgain,
    /*max_reads=*/0,
    /*erases_source=*/false,
    firmware_log_size,
    /*owns_rotated_files=*/false,
    /*appends_when_reopened=*/false,
    {
        "corvexd: qsee log node can not be read: %s \n",
        "corvexd: Open %s Error %s\n",
        "corvexd: Open %s Error %s\n",
        "corvexd: bytes_read is -1, read qsee log fail! Error: %s \n",
        nullptr,
        nullptr,
        "corvexd: qsee log node can not access: %s \n",
        "corvexd: bytes_write is -1, write qsee log fail! Error: %s \n",
        "total qsee bytes write %lld,offset %d",
    },
};

const NodeReader kTzReader = {"/proc/tzdbg/tz_log",
                              &tz_log_path,
                              &tz_from_fd,
                              &tz_to_fd,
                              /*needs_readable_source=*/false,
                              AtEnd::kReadAgain,
                              /*max_reads=*/0,
                              /*erases_source=*/false,
                              firmware_log_size,
                              /*owns_rotated_files=*/false,
                              /*appends_when_reopened=*/false,
                              {
                                  "corvexd: tz log node can not be read: %s \n",
                                  "corvexd: Open %s Error %s\n",
                                  "corvexd: Open %s Error %s\n",
                                  "corvexd: bytes_read is -1, read tz log fail! Error: %s \n",
                                  nullptr,
                                  nullptr,
                                  "corvexd: tz log node can not access: %s \n",
                                  "corvexd: bytes_write is -1, write tz log fail! Error: %s \n",
                                  "total tz bytes write %lld,offset %d",
                              }};

const NodeReader kBootloaderReader = {
    "/proc/bootloader_log",
    &bootloader_log_path,
    &bootloader_from_fd,
    &bootloader_to_fd,
    /*needs_readable_source=*/false,
    AtEnd::kStop,
    /*max_reads=*/0,
    /*erases_source=*/false,
    /*rotation_size=*/nullptr,
    /*owns_rotated_files=*/false,
    /*appends_when_reopened=*/false,
    {
        "corvexd: bootloader log node can not be read: %s \n",
        "corvexd: Open %s Error %s\n",
        nullptr,
        "corvexd: bytes_read is -1, read bootloader log fail! Error: %s \n",
        "corvexd: eof, bootloader log process continue \n",
        nullptr,
        "corvexd: bootloader log node can not access: %s \n",
        "corvexd: bytes_write is -1, write bootloader log fail! Error: %s \n",
        nullptr,
    },
};

const NodeReader kPreBootloaderReader = {
    "/dev/block/platform/soc/624000.ufshc/by-name/reserve1",
    &pre_bootloader_log_path,
    &pre_bootloader_from_fd,
    &pre_bootloader_to_fd,
    /*needs_readable_source=*/false,
    AtEnd::kStop,
    kPreBootloaderBlocks,
    /*erases_source=*/true,
    /*rotation_size=*/nullptr,
    /*owns_rotated_files=*/false,
    /*appends_when_reopened=*/false,
    {
        "corvexd: pre_bootloader log node can not be read: %s \n",
        "corvexd: Open %s Error %s\n",
        nullptr,
        "corvexd: bytes_read is -1, read pre_bootloader log fail! Error: %s \n",
        "corvexd: eof, pre_bootloader log process continue \n",
        "reserve1 is null\n",
        "corvexd: pre_bootloader log node can not access: %s \n",
        "corvexd: bytes_write is -1, write pre_bootloader log fail! Error: %s \n",
        nullptr,
    },
};

}  // namespace corvexd
