#include "cli/HomeSetup.h"

#include <filesystem>
#include <fstream>

#include "cli/ContentsText.h"
#include "cli/SampleDrive.h"
#include "cli/Text.h"

namespace droxa {

namespace {

namespace fs = std::filesystem;

// Nothing is in it, or it isn't there.
bool isEmpty(const std::string &folder) {
  std::error_code code;
  return fs::directory_iterator(folder, code) == fs::directory_iterator();
}

bool importFolder(const HomeSetupRequest &request, HomeSetup *setup, std::string *problem) {
  const FolderImportResult result = request.import(*request.folder);
  setup->imported = result.documents;
  setup->isStopped = result.end == FolderImportResult::End::stopped;
  if (result.end == FolderImportResult::End::failed)
    *problem =
        "can't put " + escapedText(*request.folder) + " into the cloud: " + escapedText(result.problem);
  setup->summary = countText(result.documents, "document") + " in " + countText(result.folders, "folder") +
                   " of " + escapedText(*request.folder) + ", " + bytesText(result.bytes) +
                   " in the cloud alone until they are read";
  if (result.leftOut > 0) setup->summary += "; " + std::to_string(result.leftOut) + " could not be read";
  return result.end != FolderImportResult::End::failed;
}

}  // namespace

std::optional<HomeSetup> setUpHome(const DroxaHome &home, const HomeSetupRequest &request,
                                   std::string *problem) {
  if (!home.create(problem)) return std::nullopt;
  // Stands for as long as the documents are being put in.
  const std::string marker = home.state() + "/filling";
  std::error_code code;
  HomeSetup setup;
  setup.isNew = fs::exists(marker, code) ||
                (isEmpty(documentsFolder(home.replica(), kDefaultContainer)) && isEmpty(home.state()));
  if (!setup.isNew) {
    setup.summary = "as it was left";
    if (request.folder) setup.summary += "; " + escapedText(*request.folder) + " is not put in again";
    return setup;
  }
  std::ofstream(marker) << "1\n";
  if (!makeContainers(home.replica(), problem)) return std::nullopt;
  if (request.folder) {
    if (!importFolder(request, &setup, problem)) return std::nullopt;
    if (setup.isStopped) return setup;
  } else if (request.hasCloudOfOthers) {
    setup.summary = "what the cloud has";
  } else {
    if (!makeSampleDrive(home.replica(), problem)) return std::nullopt;
    setup.summary = "a small sample drive";
  }
  fs::remove(marker, code);
  return setup;
}

}  // namespace droxa
