#include "sim/product/state.h"

#include "sim/product/installation.h"
#include "sim/product/instances.h"

namespace kxlprod {

void resetLibraryState() {
  resetInstallationState();
  resetProfileState();
  resetInstanceState();
  resetApplicationEnvironment();
}

} // namespace kxlprod
