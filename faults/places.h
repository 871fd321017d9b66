// Where things stand in the device that the sweep lets the daemon live on.
#pragma once

namespace corvexd::faults {

constexpr char kProgram[] = "/build/faults/corvexd_gated";
// The daemon's root is the device's once more, but with firmware nodes in its /proc. The tracer,
// which needs the true one, sees the daemon's files below this.
constexpr char kJail[] = "/jail";
constexpr char kTraces[] = "/trace";
constexpr char kPartition[] = "/dev/block/platform/soc/624000.ufshc/by-name/reserve1";

}  // namespace corvexd::faults
