#include <algorithm>
#include <array>
#include <atomic>
#include <csignal>
#include <random>
#include <sys/wait.h>
#include <thread>

#include "ContentsFixture.h"

namespace droxa::keld {
namespace {

constexpr int kDocuments = 6;
constexpr unsigned kVersions = 3;
constexpr int kKills = 40;
constexpr std::size_t kTokenBytes = 16;

std::string nameOf(int document) {
  return "document " + std::to_string(document);
}

std::string contentsOf(int document, unsigned version) {
  const auto number = static_cast<unsigned>(document) * kVersions + version;
  return BytesOfLength(3'000 + number * 2'500, 100 + number);
}

// The daemon's side: materialises, evicts and replaces at random, until it is killed.
class Worker {
 public:
  Worker(const ContentsReplica &replica, unsigned seed) : replica_(replica), random_(seed) {}

  [[noreturn]] void work() {
    for (;;) step(static_cast<int>(random_() % kDocuments));
  }

 private:
  void step(int document) {
    const std::string name = nameOf(document);
    const auto look = replica_.look(name);
    const bool isPromiseForm = replica_.storage().form() == DatalessForm::promise;
    if (look.kind == DocumentClass::dataless) {
      random_() % 3 != 0 ? materialise(document, look) : replace(document, look);
    } else if (look.kind == DocumentClass::evicting) {
      replica_.storage().finishEviction(replica_.folder(), name);
    } else if (look.kind == DocumentClass::present || (isPromiseForm && look.kind == DocumentClass::plain)) {
      random_() % 2 == 0 ? evict(document, look) : replace(document, look);
    }
  }
  // The version whose contents these are: its size tells.
  static unsigned versionOf(int document, std::uint64_t size) {
    unsigned version = 0;
    while (version < kVersions && contentsOf(document, version).size() != size) ++version;
    return version;
  }
  DocumentMarker markerOf(int document, unsigned version) const {
    return replica_.markerOf(contentsOf(document, version), std::to_string(version));
  }
  void materialise(int document, const DocumentLook &look) {
    const unsigned version = versionOf(document, look.facts.size);
    if (version == kVersions) return;
    if (const auto part = replica_.finishedPart(contentsOf(document, version)))
      replica_.storage().materialise(replica_.folder(), nameOf(document), *part,
                                     random_() % 2 == 0 ? PartUse::consume : PartUse::keep,
                                     markerOf(document, version), 0640, look.facts);
  }
  void evict(int document, const DocumentLook &look) {
    const unsigned version = versionOf(document, look.facts.size);
    if (version == kVersions) return;
    replica_.storage().evict(replica_.folder(), nameOf(document), look.facts, markerOf(document, version));
  }
  void replace(int document, const DocumentLook &look) {
    if (look.facts.modified != ContentsReplica::kDate) return;
    const auto version = static_cast<unsigned>(random_() % kVersions);
    auto prepared = makePrepared(document, version);
    if (prepared)
      replica_.storage().replaceContents(replica_.folder(), nameOf(document), prepared, look.facts);
  }
  PreparedFile makePrepared(int document, unsigned version) {
    const auto marker = markerOf(document, version);
    if (random_() % 2 == 0)
      return std::move(replica_.storage().preparePlaceholder(marker, 0640, {0, ContentsReplica::kDate}).file);
    const auto part = replica_.finishedPart(contentsOf(document, version));
    if (!part) return {};
    return std::move(replica_.storage().prepareContents(*part, PartUse::consume, marker, 0640).file);
  }

  const ContentsReplica &replica_;
  std::mt19937 random_;
};

// The user, who edits documents in the usual ways, and remembers what was written last.
class User {
 public:
  User(const ContentsReplica &replica, unsigned seed) : replica_(replica), random_(seed) {}
  ~User() { stop(); }
  void start() {
    thread_ = std::thread([this] {
      while (!isStopped_) {
        edit(static_cast<int>(random_() % kDocuments));
        std::this_thread::sleep_for(std::chrono::microseconds(random_() % 6'000));
      }
    });
  }
  void stop() {
    isStopped_ = true;
    if (thread_.joinable()) thread_.join();
  }
  const std::string &lastEdit(int document) const { return edits_[static_cast<std::size_t>(document)]; }
  int count() const { return static_cast<int>(next_ - kFirst); }

 private:
  void edit(int document) {
    std::string token = "edit " + std::to_string(next_++);
    token.resize(kTokenBytes, '.');
    const bool isDone = random_() % 3 == 0 ? saveByRename(document, token) : writeInPlace(document, token);
    if (isDone) edits_[static_cast<std::size_t>(document)] = token;
  }
  bool writeInPlace(int document, const std::string &token) {
    const int truncates = random_() % 2 == 0 ? O_TRUNC : 0;
    const OwnedDescriptor file(
        ::open(replica_.path(nameOf(document)).c_str(), O_WRONLY | truncates | O_CLOEXEC));
    return file && ::pwrite(file.get(), token.data(), token.size(), 0) == static_cast<ssize_t>(token.size());
  }
  bool saveByRename(int document, const std::string &token) {
    const std::string temporary = replica_.path("saving");
    std::ofstream(temporary, std::ios::binary) << token << " in a file of its own";
    return ::rename(temporary.c_str(), replica_.path(nameOf(document)).c_str()) == 0;
  }

  static constexpr unsigned kFirst = 1'000'000;
  const ContentsReplica &replica_;
  std::mt19937 random_;
  std::atomic<bool> isStopped_{false};
  std::thread thread_;
  // The thread's, until it is joined.
  unsigned next_ = kFirst;
  std::array<std::string, kDocuments> edits_;
};

class Crashes : public EachStorageKind {
 protected:
  void publish(int document) {
    ASSERT_EQ(replica_.publishPlaceholder(nameOf(document), contentsOf(document, 0)).outcome,
              ContentsOutcome::done);
  }
  void runAndKill(User *user, std::mt19937 &random) {
    const auto seed = static_cast<unsigned>(random());
    const pid_t child = ::fork();
    if (child == 0) Worker(replica_, seed).work();
    user->start();
    // The moment of the kill is what varies; nothing is waited for.
    std::this_thread::sleep_for(std::chrono::microseconds(2'000 + random() % 40'000));
    ASSERT_EQ(::kill(child, SIGKILL), 0);
    ASSERT_EQ(::waitpid(child, nullptr, 0), child);
    user->stop();
  }
  bool isCloudsContents(int document, const std::string &bytes) const {
    for (unsigned version = 0; version < kVersions; ++version)
      if (bytes == contentsOf(document, version)) return true;
    return false;
  }
  static std::string tokenOf(const std::string &bytes) { return bytes.substr(0, kTokenBytes); }

  // Whole, or a clean placeholder, or edited by the user.
  void checkDocument(int document, const std::string &lastEdit, const std::vector<std::string> &rescued) {
    const std::string name = nameOf(document);
    auto look = replica_.look(name);
    if (look.kind == DocumentClass::evicting) {
      EXPECT_EQ(replica_.storage().finishEviction(replica_.folder(), name).outcome, ContentsOutcome::done);
      look = replica_.look(name);
      EXPECT_EQ(look.kind, DocumentClass::dataless);
    }
    const std::string bytes = replica_.read(name);
    const bool isHere = !lastEdit.empty() && tokenOf(bytes) == lastEdit;
    if (!isHere) {
      const bool isWhole = (look.kind == DocumentClass::present || look.kind == DocumentClass::plain) &&
                           isCloudsContents(document, bytes);
      EXPECT_TRUE(isWhole || look.kind == DocumentClass::dataless)
          << name << " is " << testing::PrintToString(look.kind) << " and begins with " << tokenOf(bytes);
    } else {
      EXPECT_NE(look.kind, DocumentClass::dataless);
      EXPECT_NE(look.kind, DocumentClass::present);
    }
    const bool isRescued = std::find(rescued.begin(), rescued.end(), lastEdit) != rescued.end();
    EXPECT_TRUE(lastEdit.empty() || isHere || isRescued) << name << " lost " << lastEdit;
  }
  std::vector<std::string> takeRescued() {
    std::vector<std::string> tokens;
    for (const auto &file : replica_.storage().recover()) {
      EXPECT_EQ(file.folderPath, "folder");
      EXPECT_TRUE(replica_.storage().placeRescued(file.id, replica_.folder(), "rescued").isDone());
      tokens.push_back(tokenOf(replica_.read("rescued")));
      EXPECT_EQ(::unlink(replica_.path("rescued").c_str()), 0);
    }
    return tokens;
  }
  // As if what was edited had been taken to the cloud, and a new document had come from there.
  void renew(int document) {
    ::unlink(replica_.path(nameOf(document)).c_str());
    ::unlink(replica_.path(PromiseNameFor(nameOf(document))).c_str());
    publish(document);
  }
};

constexpr auto kKinds = {kPlaceholders, kPromises, kPromisesWithoutExchange};
INSTANTIATE_TEST_SUITE_P(Each, Crashes, testing::ValuesIn(kKinds), StorageKindName);

TEST_P(Crashes, loseNoEditAndLeaveDocumentsWholeOrDataless) {
  std::mt19937 random(static_cast<unsigned>(::getpid()));
  int edits = 0;
  for (int document = 0; document < kDocuments; ++document) publish(document);
  for (int kill = 0; kill < kKills && !HasFailure(); ++kill) {
    User user(replica_, static_cast<unsigned>(random()));
    runAndKill(&user, random);
    replica_.reopen();
    const auto rescued = takeRescued();
    replica_.expectTidy();
    for (int document = 0; document < kDocuments; ++document) {
      checkDocument(document, user.lastEdit(document), rescued);
      if (!user.lastEdit(document).empty()) renew(document);
    }
    edits += user.count();
  }
  EXPECT_GT(edits, kKills);
}

}  // namespace
}  // namespace droxa::keld
