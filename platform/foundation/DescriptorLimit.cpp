#include "platform/foundation/DescriptorLimit.h"

#include <algorithm>
#include <sys/resource.h>

namespace droxa {

void DroxaRaiseDescriptorLimit() {
  constexpr rlim_t kWanted = 65'536;
  rlimit limit{};
  if (getrlimit(RLIMIT_NOFILE, &limit) != 0 || limit.rlim_cur >= kWanted) return;
  limit.rlim_cur = std::min(kWanted, limit.rlim_max);
  (void)setrlimit(RLIMIT_NOFILE, &limit);  // with the limit that there is, clients are refused sooner
}

}  // namespace droxa
