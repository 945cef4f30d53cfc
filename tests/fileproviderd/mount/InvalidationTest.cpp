#include <fcntl.h>
#include <unistd.h>

#include "fileproviderd/mount/Invalidation.h"
#include "tests/fileproviderd/mount/DriveFixture.h"

namespace droxa::testing {
namespace {

using namespace std::chrono_literals;

// Thread contract: any thread.
class RecordingNotices final : public KernelNotices {
 public:
  void contentsChanged(NodeId node) override { told.put("contents " + std::to_string(node)); }
  void attributesChanged(NodeId node, bool) override { told.put("attributes " + std::to_string(node)); }
  void listingChanged(NodeId folder) override { told.put("listing " + std::to_string(folder)); }
  void appeared(NodeId, const std::string &name, const struct stat &) override { told.put("new " + name); }
  void disappeared(NodeId, const std::string &name, NodeId, mode_t) override { told.put("gone " + name); }

  Arrivals<std::string> told;
};

class InvalidationTest : public DriveFixture {
 protected:
  InvalidationTest() {
    drive->news = &invalidation;
    drive->watch.start([this](NodeId folder, const std::string &name,
                              bool isNew) { invalidation.seen(folder, name, isNew); },
                       [this] { invalidation.missed(); });
    int error = 0;
    drive->watch.add(kRootNode, drive->folder(kRootNode, &error)->get());
    invalidation.start();
  }
  ~InvalidationTest() override {
    drive->watch.stop();
    invalidation.stop();
  }
  // What was told before `marker` appeared, which is made behind the mount.
  std::vector<std::string> toldBefore(const std::string &marker) {
    std::vector<std::string> told;
    write(marker, "");
    for (std::string one = notices->told.take(); !one.empty() && one != "new " + marker;
         one = notices->told.take())
      told.push_back(one);
    return told;
  }

  const std::shared_ptr<RecordingNotices> notices = std::make_shared<RecordingNotices>();
  Invalidation invalidation{drive, notices};
};

TEST_F(InvalidationTest, whatIsMadeAndRemovedBehindTheMountIsTold) {
  write("a", "");
  EXPECT_EQ(notices->told.take(), "new a");
  const NodeId node = lookUp(kRootNode, "a");
  std::filesystem::remove(documents + "/a");
  EXPECT_EQ(notices->told.take(), "gone a");
  EXPECT_EQ(drive->nodes.find(kRootNode, "a"), 0U);
  EXPECT_NE(node, 0U);
}

TEST_F(InvalidationTest, aChangeOfAFileThatTheKernelDoesNotKnowIsNothing) {
  write("a", "");
  EXPECT_EQ(notices->told.take(), "new a");
  write("a", "more");
  EXPECT_EQ(toldBefore("end"), std::vector<std::string>());
}

TEST_F(InvalidationTest, contentsAndAttributesAreToldApart) {
  write("a", "one");
  EXPECT_EQ(notices->told.take(), "new a");
  const std::string node = std::to_string(lookUp(kRootNode, "a"));
  std::filesystem::permissions(documents + "/a", std::filesystem::perms::owner_all);
  EXPECT_EQ(notices->told.take(), "attributes " + node);
  write("a", "another");
  EXPECT_EQ(notices->told.take(), "contents " + node);
}

TEST_F(InvalidationTest, whatIsDoneThroughTheMountIsNotTold) {
  write("a", "one");
  EXPECT_EQ(notices->told.take(), "new a");
  const NodeId node = lookUp(kRootNode, "a");
  int error = 0;
  const Descriptor file = drive->open(node, O_WRONLY, &error);
  ASSERT_TRUE(file);
  for (int i = 0; i < 20; ++i) {
    OwnChange change(*drive, node);
    change.setDescriptor(file.get());
    ASSERT_EQ(pwrite(file.get(), "xy", 2, i), 2);
  }
  {
    const BusyNames::Guard guard(drive->busy, {{kRootNode, "b"}});
    write("b", "");
    lookUp(kRootNode, "b");
  }
  EXPECT_EQ(toldBefore("end"), std::vector<std::string>());
}

TEST_F(InvalidationTest, aFileThatTakesAnothersPlaceIsTold) {
  write("a", "one");
  EXPECT_EQ(notices->told.take(), "new a");
  lookUp(kRootNode, "a");
  std::ofstream(replica + "/other") << "another";
  std::filesystem::rename(replica + "/other", documents + "/a");
  EXPECT_EQ(notices->told.take(), "gone a");
  EXPECT_EQ(notices->told.take(), "new a");
}

TEST_F(InvalidationTest, whatWasMissedIsFoundByComparing) {
  write("a", "one");
  EXPECT_EQ(notices->told.take(), "new a");
  const std::string node = std::to_string(lookUp(kRootNode, "a"));
  drive->watch.remove(kRootNode);
  write("a", "another");
  invalidation.missed();
  EXPECT_EQ(notices->told.take(), "listing 1");
  EXPECT_EQ(notices->told.take(), "contents " + node);
}

}  // namespace
}  // namespace droxa::testing
