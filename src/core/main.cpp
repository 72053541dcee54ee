#include "core/run_daemon.h"

int main() { return quorvel::run_daemon(); }
