// The programs of the toolbox. Each takes its arguments like a main and answers its exit status.
#pragma once

namespace corvexd::sim {

int logcat_main(int argc, char** argv);
int log_main(int argc, char** argv);
int getprop_main(int argc, char** argv);
int setprop_main(int argc, char** argv);

}  // namespace corvexd::sim
