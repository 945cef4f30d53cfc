#pragma once

#include <gtest/gtest.h>
#include <memory>
#include <nlohmann/json.hpp>
#include <string>
#include <vector>

#include "tests/system/Drive.h"
#include "tests/system/OwnEtc.h"

namespace droxa::testing {

inline constexpr auto kPatience = 60s;  // the machine is busy

inline constexpr char kSharingProxy[] = "com.quorva.Tessaly.sharing-proxy";
inline constexpr char kSharingPrivateInterface[] = "com.quorva.Tessaly.sharing-private-interface";
inline constexpr char kFolderSharingProxy[] = "com.quorva.Tessaly.folder-sharing-proxy";
std::vector<std::string> allSharingEntitlements();

// The client program (client/main.cpp) on an item of the drive.
std::unique_ptr<Process> startShareClient(const Drive &drive, const std::string &path,
                                          const std::vector<std::string> &words, const std::string &name);
Result runShareClient(const Drive &drive, const std::string &path, const std::vector<std::string> &words);
// Whether it said the text by now.
bool hasSaid(const Process &process, const std::string &text);

// The open descriptors of a process, but for those of databases' files, of which readers keep more or fewer.
std::size_t openDescriptors(pid_t process);
// The fewest within a moment: connections that have ended are still being put away.
std::size_t fewestDescriptors(pid_t process);
void expectAtMost(std::size_t descriptors, pid_t process);  // before long
long residentKilobytes(pid_t process);

// Nobody is entitled to anything at the start.
class SharingTests : public ::testing::Test {
 protected:
  void SetUp() override;

  // Why programs can't be entitled to anything here; "" when they can.
  static std::string whyNotEntitled();
  static void entitleClients(const std::vector<std::string> &entitlements);  // the client program
  static void entitleCommand(const std::vector<std::string> &entitlements);  // droxa

  // `droxa share words… --json`, done or not.
  static nlohmann::json share(Drive &drive, std::vector<std::string> words);
  static void expectRefused(Drive &drive, const std::vector<std::string> &words, const std::string &reason);
  // Writes a document into the drive, and waits until the drive shows it.
  static void makeDocument(Drive &drive, const std::string &path, const std::string &contents);
};

// Those that are about applications with entitlements: skipped, and why, where nobody can have any.
class EntitledSharingTests : public SharingTests {
 protected:
  void SetUp() override;
};

}  // namespace droxa::testing
