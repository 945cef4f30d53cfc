#include <cerrno>
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include "fileproviderd/mount/Materialising.h"
#include "platform/fileprovider/NSFileProviderError.h"
#include "tests/fileproviderd/ScriptedExtension.h"

namespace droxa::testing {
namespace {

using namespace std::chrono_literals;

class MaterialisingTest : public ::testing::Test {
 protected:
  ~MaterialisingTest() override {
    for (const auto &providing : extension->providings) providing->drop();
  }
  Materialising::Ticket wait(const std::string &path = "/r/a", pid_t process = 0) {
    const auto ticket = materialising->newTicket();
    materialising->wait(ticket, path, process, [this, ticket](int error) { ends.put({ticket, error}); });
    return ticket;
  }
  using End = std::pair<Materialising::Ticket, int>;

  const std::shared_ptr<ScriptedExtension> extension = std::make_shared<ScriptedExtension>();
  const std::shared_ptr<ExtensionCalls> calls =
      std::make_shared<ExtensionCalls>(std::make_shared<ScriptedConnecting>(extension));
  std::shared_ptr<Materialising> materialising =
      std::make_shared<Materialising>(std::make_shared<Providings>(calls), 60s);
  Arrivals<End> ends;
};

TEST_F(MaterialisingTest, allThatWaitForADocumentShareOneDownload) {
  wait();
  wait();
  ASSERT_EQ(extension->providings.size(), 1U);
  extension->providings[0]->end({});
  EXPECT_EQ(ends.take().second, 0);
  EXPECT_EQ(ends.take().second, 0);
  EXPECT_EQ(materialising->waiting(), 0U);
}

TEST_F(MaterialisingTest, aFailureIsToldAsAnErrno) {
  wait();
  extension->providings[0]->end(NSError(NSFileProviderErrorDomain, NSFileProviderErrorInsufficientQuota));
  EXPECT_EQ(ends.take().second, EDQUOT);
}

TEST_F(MaterialisingTest, oneThatIsInterruptedLeavesTheOthersTheirDownload) {
  const auto first = wait();
  const auto second = wait();
  materialising->interrupt(first);
  EXPECT_EQ(ends.take(), End(first, EINTR));
  EXPECT_EQ(extension->providings[0]->cancels, 0);
  materialising->interrupt(second);
  EXPECT_EQ(ends.take(), End(second, EINTR));
  EXPECT_EQ(extension->providings[0]->cancels, 1);
}

TEST_F(MaterialisingTest, anInterruptThatComesBeforeTheWaitEndsIt) {
  const auto ticket = materialising->newTicket();
  materialising->interrupt(ticket);
  materialising->wait(ticket, "/r/a", 0, [&](int error) { ends.put({ticket, error}); });
  EXPECT_EQ(ends.take(), End(ticket, EINTR));
  EXPECT_TRUE(extension->providings.empty());
}

TEST_F(MaterialisingTest, patienceEnds) {
  materialising = std::make_shared<Materialising>(std::make_shared<Providings>(calls), 50ms);
  wait();
  EXPECT_EQ(ends.take().second, ETIMEDOUT);
  EXPECT_EQ(extension->providings[0]->cancels, 1);
}

TEST_F(MaterialisingTest, patienceLastsForAsLongAsSomethingComes) {
  constexpr auto kPatience = 400ms;
  materialising = std::make_shared<Materialising>(std::make_shared<Providings>(calls), kPatience);
  const auto before = std::chrono::steady_clock::now();
  const auto ticket = materialising->newTicket();
  materialising->wait(ticket, "/r/a", 0, [&](int error) { ends.put({ticket, error}); });
  ASSERT_EQ(extension->providings.size(), 1U);
  extension->providings[0]->mostProgress = 10;
  EXPECT_EQ(ends.take().second, ETIMEDOUT);
  EXPECT_GE(extension->providings[0]->progressQuestions, 10);
  EXPECT_GE(std::chrono::steady_clock::now() - before, 2 * kPatience);
}

TEST_F(MaterialisingTest, theDeathOfWhoWaitsEndsIt) {
  const pid_t child = fork();
  if (child == 0) {
    pause();
    _exit(0);
  }
  wait("/r/a", child);
  EXPECT_EQ(ends.size(), 0U);
  kill(child, SIGKILL);
  waitpid(child, nullptr, 0);
  EXPECT_EQ(ends.take().second, EINTR);
}

TEST_F(MaterialisingTest, afterAStopNobodyWaits) {
  wait();
  materialising->stop(ENOTCONN);
  EXPECT_EQ(ends.take().second, ENOTCONN);
  wait();
  EXPECT_EQ(ends.take().second, ENOTCONN);
}

}  // namespace
}  // namespace droxa::testing
