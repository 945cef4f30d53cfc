#pragma once

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>
#include <stdexcept>
#include <string>

#include "fileproviderd/mount/MountedDrive.h"
#include "tests/fileproviderd/ScriptedExtension.h"

namespace droxa::testing {

// A replica in a temporary folder: the default container, "Desktop", and a scripted extension that knows
// them. Thread contract: the test's thread.
class DriveFixture : public ::testing::Test {
 protected:
  DriveFixture() {
    std::string folder = std::filesystem::temp_directory_path().native() + "/droxa-mounted-drive-XXXXXX";
    if (mkdtemp(folder.data()) == nullptr) throw std::runtime_error("no temporary folder");
    replica = std::filesystem::canonical(folder).native();
    documents = replica + "/default/Documents";
    std::filesystem::create_directories(documents);
    std::filesystem::create_directories(replica + "/desktop/Documents");
    std::filesystem::create_directories(replica + "/.droxa-private/Documents");
    NSFileProviderItemFields root;
    root.itemIdentifier = NSFileProviderRootContainerItemIdentifier;
    root.kind = NSFileProviderItemKind::folder;
    extension->add(root.itemIdentifier, documents, root);
    addContainer("i6", "desktop", "Desktop");
    roots = std::make_shared<MountRoots>(calls, replica, ".Trash-1");
    roots->refresh([this](bool isWhole) { areRootsWhole = isWhole; });
    drive = std::make_shared<MountedDrive>(roots, nullptr, calls);
  }
  ~DriveFixture() override {
    std::error_code ignored;
    std::filesystem::remove_all(replica, ignored);
  }

  void addContainer(const std::string &identifier, const std::string &folder, const std::string &name) {
    NSFileProviderItemFields fields;
    fields.itemIdentifier = identifier;
    fields.filename = name;
    fields.kind = NSFileProviderItemKind::folder;
    extension->add(identifier, replica + "/" + folder + "/Documents", fields);
  }
  void write(const std::string &name, const std::string &contents) const {
    std::ofstream(documents + "/" + name, std::ios::trunc) << contents;
  }
  // The kernel looks `name` up.
  NodeId lookUp(NodeId parent, const std::string &name) const {
    struct stat status {};
    if (drive->look(parent, name, &status) != 0) return 0;
    return drive->nodes.enter(parent, name, status).node;
  }

  std::string replica, documents;
  bool areRootsWhole = false;
  const std::shared_ptr<ScriptedExtension> extension = std::make_shared<ScriptedExtension>();
  const std::shared_ptr<ExtensionCalls> calls =
      std::make_shared<ExtensionCalls>(std::make_shared<ScriptedConnecting>(extension));
  std::shared_ptr<MountRoots> roots;
  std::shared_ptr<MountedDrive> drive;
};

}  // namespace droxa::testing
