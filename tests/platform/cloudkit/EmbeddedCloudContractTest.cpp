#include "tests/platform/cloudkit/CloudContract.h"
#include "tests/platform/cloudkit/EmbeddedWorld.h"

namespace droxa {

DROXA_CLOUD_CONTRACT(EmbeddedCloud, EmbeddedWorld)

}  // namespace droxa
