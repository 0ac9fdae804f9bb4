#include "daemon/daemon.h"

// zyrd takes no command-line options; see README.md for its configuration.
int main() { Zyrd::RunDaemon(); }
