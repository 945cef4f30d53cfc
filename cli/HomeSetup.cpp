#include "cli/HomeSetup.h"

#include <filesystem>
#include <fstream>

#include "cli/DocumentCopy.h"
#include "cli/SampleDrive.h"
#include "cli/Text.h"

namespace droxa {

namespace {

namespace fs = std::filesystem;

constexpr int kMostReported = 5;

// Nothing is in it, or it isn't there.
bool isEmpty(const std::string &folder) {
  std::error_code code;
  return fs::directory_iterator(folder, code) == fs::directory_iterator();
}

bool fillFromFolder(const DroxaHome &home, const std::string &folder, std::ostream &err, std::string *summary,
                    std::string *problem) {
  int reported = 0;
  DocumentCopy copy(home.root(), [&](const std::string &path, const std::string &reason) {
    if (reported++ < kMostReported)
      err << "droxa: left out " << escapedText(path) << ": " << reason << std::endl;
  });
  DocumentCopy::Result result;
  if (!copy.copy(folder, documentsFolder(home.replica(), kDefaultContainer), &result, problem)) return false;
  *summary = "a copy of " + countText(result.documents, "document") + " in " +
             countText(result.folders, "folder") + " of " + escapedText(folder);
  if (result.leftOut > 0) *summary += "; " + std::to_string(result.leftOut) + " things could not be copied";
  return true;
}

}  // namespace

std::optional<HomeSetup> setUpHome(const DroxaHome &home, const std::optional<std::string> &folder,
                                   std::ostream &err, std::string *problem) {
  if (!home.create(problem)) return std::nullopt;
  // Stands for as long as the documents are being put in.
  const std::string marker = home.state() + "/filling";
  std::error_code code;
  HomeSetup setup;
  setup.isNew = fs::exists(marker, code) ||
                (isEmpty(documentsFolder(home.replica(), kDefaultContainer)) && isEmpty(home.state()));
  if (!setup.isNew) {
    setup.summary = "as it was left";
    if (folder) setup.summary += "; " + escapedText(*folder) + " is not copied again";
    return setup;
  }
  std::ofstream(marker) << "1\n";
  if (!makeContainers(home.replica(), problem)) return std::nullopt;
  if (folder) {
    if (!fillFromFolder(home, *folder, err, &setup.summary, problem)) return std::nullopt;
  } else {
    if (!makeSampleDrive(home.replica(), problem)) return std::nullopt;
    setup.summary = "a small sample drive";
  }
  fs::remove(marker, code);
  return setup;
}

}  // namespace droxa
