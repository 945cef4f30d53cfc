#include <limits>
#include <map>
#include <numeric>
#include <set>

#include "tests/platform/FileWorkerProcess.h"
#include "tests/platform/StormOperation.h"
#include "tests/platform/fileprovider/OperationsFixture.h"

namespace droxa {
namespace {

// What the operations mean, one after the other: which paths there are, and whether each is a folder ('d') or
// which document it is.
using Model = std::map<std::string, char>;

std::string joined(const std::string &folder, const std::string &name) {
  return folder.empty() ? name : folder + "/" + name;
}

std::string parentOf(const std::string &path) {
  const std::size_t slash = path.rfind('/');
  return slash == std::string::npos ? "" : path.substr(0, slash);
}

bool isBelow(const std::string &path, const std::string &folder) {
  return path == folder || path.starts_with(folder + "/");
}

bool isFolder(const Model &model, const std::string &path) {
  const auto found = model.find(path);
  return path.empty() || (found != model.end() && found->second == 'd');
}

std::int64_t put(Model &model, const std::string &folder, const std::string &name, char what) {
  if (!isFolder(model, folder)) return NSFileNoSuchFileError;
  return model.emplace(joined(folder, name), what).second ? 0 : NSFileWriteFileExistsError;
}

std::int64_t move(Model &model, const std::string &item, const std::string &folder, const std::string &name) {
  if (!isFolder(model, folder) || !model.contains(item)) return NSFileNoSuchFileError;
  if (isFolder(model, item) && isBelow(folder, item)) return NSFileWriteUnknownError;
  const std::string to = joined(folder, name);
  if (to == item) return 0;
  if (model.contains(to)) return NSFileWriteFileExistsError;
  Model moved;
  for (const auto &[path, what] : model) {
    moved[isBelow(path, item) ? to + path.substr(item.size()) : path] = what;
  }
  model.swap(moved);
  return 0;
}

std::int64_t apply(Model &model, const StormOperation &operation) {
  using Kind = StormOperation::Kind;
  switch (operation.kind) {
    case Kind::create:
      return put(model, operation.folder, operation.name, 'd');
    case Kind::import:
      return put(model, operation.folder, operation.name, operation.name[0]);
    case Kind::rename:
      return move(model, operation.item, parentOf(operation.item), operation.name);
    case Kind::move:
      return move(model, operation.item, operation.folder, operation.name);
    case Kind::remove:
      break;
  }
  if (!model.contains(operation.item)) return NSFileNoSuchFileError;
  std::erase_if(model, [&](const auto &entry) { return isBelow(entry.first, operation.item); });
  return 0;
}

// Looks for one serial order of all operations in which each begins after those that ended before it began,
// ends as it was reported, and that leads to the state that was found.
class SerialOrder {
 public:
  SerialOrder(std::vector<std::vector<StormOperation>> processes, Model found)
      : processes_(std::move(processes)), found_(std::move(found)) {}
  bool exists(const Model &begin) { return search(std::vector<std::size_t>(processes_.size(), 0), begin); }
  std::size_t longest() const { return longest_; }

 private:
  bool search(const std::vector<std::size_t> &done, const Model &model) {
    if (!seen_.emplace(done, model).second) return false;
    longest_ = std::max(longest_, std::accumulate(done.begin(), done.end(), std::size_t{0}));
    std::int64_t firstEnd = std::numeric_limits<std::int64_t>::max();
    bool isComplete = true;
    for (std::size_t i = 0; i < done.size(); ++i) {
      if (done[i] == processes_[i].size()) continue;
      isComplete = false;
      firstEnd = std::min(firstEnd, processes_[i][done[i]].ended);
    }
    if (isComplete) return model == found_;
    for (std::size_t i = 0; i < done.size(); ++i) {
      if (done[i] == processes_[i].size() || processes_[i][done[i]].began > firstEnd) continue;
      Model next = model;
      if (apply(next, processes_[i][done[i]]) != processes_[i][done[i]].code) continue;
      std::vector<std::size_t> then = done;
      ++then[i];
      if (search(then, next)) return true;
    }
    return false;
  }

  const std::vector<std::vector<StormOperation>> processes_;
  const Model found_;
  std::set<std::pair<std::vector<std::size_t>, Model>> seen_;
  std::size_t longest_ = 0;
};

std::string described(const Model &model) {
  std::string text;
  for (const auto &[path, what] : model) text += path + ":" + what + " ";
  return text;
}

struct Storm : OperationsOnFileSystems {
  Model found() const {
    Model model;
    for (const auto &entry : fs::recursive_directory_iterator(path("drive"))) {
      const std::string name = entry.path().string().substr(path("drive").size() + 1);
      model[name] = entry.is_directory() ? 'd' : read("drive/" + name).at(0);
    }
    return model;
  }
  std::vector<std::vector<StormOperation>> blow(unsigned seed) const {
    constexpr int kProcesses = 5;
    constexpr int kOperations = 40;
    std::vector<std::unique_ptr<FileWorkerProcess>> workers;
    for (unsigned i = 0; i < kProcesses; ++i) {
      workers.push_back(std::make_unique<FileWorkerProcess>(
          std::vector<std::string>{coordination.path() + "/locks", "storm", root,
                                   std::to_string(seed * 100 + i), std::to_string(kOperations)}));
    }
    std::vector<std::vector<StormOperation>> done(kProcesses);
    for (unsigned i = 0; i < kProcesses; ++i) {
      for (int n = 0; n < kOperations; ++n)
        done[i].push_back(StormOperation::fromLine(workers[i]->nextLine()));
      EXPECT_EQ(workers[i]->waitForEnd(), 0);
    }
    return done;
  }
};
INSTANTIATE_TEST_SUITE_P(On, Storm, testing::ValuesIn(testedFileSystems()), fileSystemName);

TEST_P(Storm, endsAsSomeSerialOrderDoes) {
  write("outside/x", "x");
  write("outside/y", "y");
  for (unsigned seed = 1; seed <= 3; ++seed) {
    fs::remove_all(path("drive"));
    makeFolder("drive");
    const auto reported = blow(seed);
    SerialOrder order(reported, found());
    EXPECT_TRUE(order.exists({})) << "seed " << seed << ": only " << order.longest()
                                  << " of 200 can be explained; left: " << described(found());
  }
}

TEST_P(Storm, theCheckerFindsWhatNoOrderExplains) {
  StormOperation made;
  made.name = "a";
  made.ended = 1;
  StormOperation again = made;
  again.began = 2;
  again.ended = 3;
  EXPECT_FALSE(SerialOrder({{made, again}}, {{"a", 'd'}}).exists({}));
  again.code = NSFileWriteFileExistsError;
  EXPECT_TRUE(SerialOrder({{made, again}}, {{"a", 'd'}}).exists({}));
  EXPECT_TRUE(SerialOrder({{made}, {again}}, {{"a", 'd'}}).exists({}));
  EXPECT_FALSE(SerialOrder({{again}, {made}}, {}).exists({}));
}

}  // namespace
}  // namespace droxa
