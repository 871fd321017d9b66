#include "core/control_socket.h"
#include "core/settings.h"
#include "core/state.h"

int main() {
  corvexd::loadSettings();
  corvexd::checkLogPath();
  corvexd::serve_clients(corvexd::open_control_socket());
}
