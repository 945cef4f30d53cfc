#pragma once

#include <map>
#include <string>

namespace droxa {

// Where folders of the replica are shown: absolute paths of the replica by paths from the mount's root ("" is
// the root itself).
using ShownFolders = std::map<std::string, std::string>;

// What a link in the folder `shownFolder` of the mount ("" or "a/b") leads to: `target`, unless that would
// leave what is shown together with the link, and leads to something that is shown elsewhere in the mount. An
// alias of one container in another is such a link. `replicaFolder`: where the link's folder is in the
// replica. Looks at text alone. Any thread.
std::string shownLinkTarget(const std::string &target, const std::string &shownFolder,
                            const std::string &replicaFolder, const ShownFolders &shown);

}  // namespace droxa
