#include "sim/product/state.h"

#include "sim/product/installation.h"

namespace kxlprod {

void resetLibraryState() {
  resetInstallationState();
  resetProfileState();
}

} // namespace kxlprod
