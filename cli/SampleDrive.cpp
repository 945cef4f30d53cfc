#include "cli/SampleDrive.h"

#include <array>
#include <filesystem>
#include <fstream>

namespace droxa {

namespace {

namespace fs = std::filesystem;

constexpr char kDocumentsContainer[] = "com.quorva.Tessaly.documents";
constexpr char kDesktopContainer[] = "com.quorva.Tessaly.desktop";
constexpr char kTrashContainer[] = "com.quorva.Tessaly.trash";
constexpr char kSketchesContainer[] = "org.example.sketches";

struct SampleDocument {
  const char *container;
  const char *path;  // inside the container's folder
  const char *text;
};

constexpr std::array<SampleDocument, 12> kDocuments{{
    {kDefaultContainer, "Documents/Welcome.txt",
     "This is your drive.\n\nEverything in this folder is a plain file: change it with any program, and\n"
     "`droxa watch /` shows what happens.\n"},
    {kDefaultContainer, "Documents/Recipes/Bread.md",
     "# Bread\n\n500 g flour, 350 g water, 10 g salt, some yeast.\n"},
    {kDefaultContainer, "Documents/Recipes/Soup.md", "# Soup\n\nLeek, potatoes, stock, patience.\n"},
    {kDefaultContainer, "Documents/Projects/Garden/Plan.md",
     "# Garden\n\n- beans by the fence\n- a second pear tree\n"},
    {kDefaultContainer, "Documents/Projects/Garden/Seeds.csv",
     "plant,sown\nbeans,2026-05-02\npeas,2026-04-11\n"},
    {kDefaultContainer, "Documents/Projects/Shed.txt", "Measure the door before you buy the bench.\n"},
    {kDefaultContainer, "Documents/~$Welcome.txt", "An editor's own note; it stays on this computer.\n"},
    {kDocumentsContainer, "Documents/Letter.txt", "Dear Ada,\n\nthe drive works.\n"},
    {kDocumentsContainer, "Documents/Budget 2026.csv", "month,planned,spent\n1,900,872\n2,900,931\n"},
    {kDesktopContainer, "Documents/To do.txt", "- water the plants\n- call the printer\n"},
    {kSketchesContainer, "Documents/First sketch.svg",
     "<svg xmlns=\"http://www.w3.org/2000/svg\" viewBox=\"0 0 9 9\"><circle cx=\"4\" cy=\"4\" "
     "r=\"3\"/></svg>\n"},
    {kSketchesContainer, "Library/recent", "First sketch.svg\n"},
}};

bool write(const fs::path &path, const char *text, std::string *problem) {
  std::error_code code;
  fs::create_directories(path.parent_path(), code);
  std::ofstream file(path, std::ios::binary);
  file << text;
  file.close();
  if (file) return true;
  *problem = "can't write " + path.native();
  return false;
}

}  // namespace

std::string documentsFolder(const std::string &replica, const std::string &container) {
  return replica + "/" + container + "/" +
         (container == std::string(kTrashContainer) ? "files" : "Documents");
}

bool makeContainers(const std::string &replica, std::string *problem) {
  for (const char *container : {kDefaultContainer, kDocumentsContainer, kDesktopContainer, kTrashContainer}) {
    std::error_code code;
    fs::create_directories(documentsFolder(replica, container), code);
    if (code) {
      *problem = documentsFolder(replica, container) + ": " + code.message();
      return false;
    }
  }
  return true;
}

bool makeSampleDrive(const std::string &replica, std::string *problem) {
  for (const SampleDocument &document : kDocuments)
    if (!write(fs::path(replica) / document.container / document.path, document.text, problem)) return false;
  const fs::path alias = fs::path(documentsFolder(replica, kDefaultContainer)) / "Budget";
  std::error_code code;
  fs::create_symlink(fs::path("../..") / kDocumentsContainer / "Documents/Budget 2026.csv", alias, code);
  if (!code || code == std::errc::file_exists) return true;
  *problem = alias.native() + ": " + code.message();
  return false;
}

}  // namespace droxa
