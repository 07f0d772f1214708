// Entry point of the upgrade command: the run, with the engine's driver.
#include "NT/kxliutil.h"
#include "engn/sqo/run.h"

int main(int argc, char **argv) {
  return runUpgrade(argc, argv, upgradeInstance);
}
