#include <csignal>
#include <fcntl.h>
#include <filesystem>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include "platform/entitlements/ProcessEntitlements.h"
#include "tests/platform/TemporaryFolder.h"

namespace droxa {
namespace {

// A child process of the test's, and how the kernel would name it.
class Child {
 public:
  // `before` runs in the child before `program` does; it may use system calls alone. Without a program the
  // child waits.
  template <class Before>
  Child(const char *program, Before before) {
    int ready[2];
    EXPECT_EQ(pipe2(ready, O_CLOEXEC), 0);
    process_ = fork();
    if (process_ == 0) {
      if (!before()) _exit(1);
      if (program) {
        execl(program, program, "1000", nullptr);
        _exit(1);
      }
      close(ready[1]);
      for (;;) pause();
    }
    close(ready[1]);
    char byte;
    EXPECT_EQ(read(ready[0], &byte, 1), 0);  // closed by exec, or by the child itself
    close(ready[0]);
    peer_.processIdentifier = process_;
    peer_.processDescriptor = static_cast<int>(syscall(SYS_pidfd_open, process_, 0));
  }
  explicit Child(const char *program) : Child(program, [] { return true; }) {}
  ~Child() {
    end();
    close(peer_.processDescriptor);
  }
  Child(const Child &) = delete;
  Child &operator=(const Child &) = delete;

  const NSXPCPeer &peer() const { return peer_; }
  void end() {
    if (process_ <= 0) return;
    kill(process_, SIGKILL);
    waitpid(process_, nullptr, 0);
    process_ = -1;
  }
  bool isAlive() const { return waitpid(process_, nullptr, WNOHANG) == 0; }

 private:
  pid_t process_ = -1;
  NSXPCPeer peer_;
};

class ProcessEntitlementsTest : public testing::Test {
 protected:
  ProcessEntitlementsTest() {
    chmod(folder.path().c_str(), 0755);
    std::filesystem::copy_file("/bin/sleep", program());
    chmod(program().c_str(), 0755);
  }
  // A program of the test's user.
  std::string program() const { return folder.path() + "/program"; }
  void write(const std::string &text) const {
    folder.write("a.json", text);
    chmod((folder.path() + "/a.json").c_str(), 0644);
  }
  void grantExecutable(const std::string &path) const {
    write(R"({"applications": [{"executable": ")" + path + R"(", "entitlements": ["one"]}]})");
  }
  bool isEntitled(const NSXPCPeer &peer) const { return EntitlementsOfPeer(peer, files).has("one"); }

  const TemporaryFolder folder;
  const EntitlementFiles files = EntitlementFiles(folder.path(), getuid());
};

TEST_F(ProcessEntitlementsTest, anExecutableIsEntitledByItsPath) {
  grantExecutable(program());
  const Child child(program().c_str());
  const ProcessEntitlements found = EntitlementsOfPeer(child.peer(), files);
  EXPECT_FALSE(found.error) << found.error.description();
  EXPECT_TRUE(found.has("one"));
  EXPECT_FALSE(found.has("two"));
  EXPECT_FALSE(found.application.flatpak);
  EXPECT_EQ(found.application.executable, program());
  ASSERT_EQ(found.grants.size(), 1U);
  EXPECT_EQ(found.grants[0].file, folder.path() + "/a.json");
}

TEST_F(ProcessEntitlementsTest, anotherProgramIsNot) {
  grantExecutable(program());
  EXPECT_FALSE(isEntitled(Child("/bin/sleep").peer()));
}

TEST_F(ProcessEntitlementsTest, aProgramThatTookThePlaceOfTheEntitledOneIsAnotherOne) {
  const Child child(program().c_str());
  std::filesystem::rename(program(), program() + ".old");
  std::filesystem::copy_file("/bin/true", program());
  chmod(program().c_str(), 0755);
  grantExecutable(program());
  EXPECT_FALSE(isEntitled(child.peer()));
}

TEST_F(ProcessEntitlementsTest, aProgramThatOthersCanWriteIsntEntitled) {
  grantExecutable(program());
  const Child child(program().c_str());
  chmod(program().c_str(), 0775);
  EXPECT_FALSE(isEntitled(child.peer()));
  chmod(program().c_str(), 0755);
  EXPECT_TRUE(isEntitled(child.peer()));
}

TEST_F(ProcessEntitlementsTest, aProcessThatHasEndedInheritsAndLeavesNothing) {
  grantExecutable(program());
  Child child(program().c_str());
  child.end();
  const ProcessEntitlements found = EntitlementsOfPeer(child.peer(), files);
  EXPECT_TRUE(found.error);
  EXPECT_FALSE(found.has("one"));
}

// As when the number has been given to another process: the descriptor is of the one that ended.
TEST_F(ProcessEntitlementsTest, aReusedProcessNumberIsSeenThrough) {
  grantExecutable(program());
  const Child entitled(program().c_str());
  Child ended(program().c_str());
  ended.end();
  NSXPCPeer reused = entitled.peer();
  reused.processDescriptor = ended.peer().processDescriptor;
  ASSERT_TRUE(isEntitled(entitled.peer()));
  const ProcessEntitlements found = EntitlementsOfPeer(reused, files);
  EXPECT_TRUE(found.error.is(NSPOSIXErrorDomain, ESRCH));
  EXPECT_FALSE(found.has("one"));
}

TEST_F(ProcessEntitlementsTest, anAllZeroTokenAndOneWithoutADescriptorHaveNothing) {
  grantExecutable(program());
  const Child child(program().c_str());
  NSXPCPeer zero;
  zero.processDescriptor = 0;
  EXPECT_FALSE(isEntitled(zero));
  EXPECT_FALSE(isEntitled(NSXPCPeer()));
  NSXPCPeer blind = child.peer();
  blind.processDescriptor = -1;
  EXPECT_FALSE(isEntitled(blind));
}

// Runs the child in a root of its own, which holds `.flatpak-info`, as a sandbox does.
class SandboxedEntitlementsTest : public ProcessEntitlementsTest {
 protected:
  std::string root() const { return folder.path() + "/root"; }
  void writeInfo(const std::string &text) const { folder.write("root/.flatpak-info", text); }
  ProcessEntitlements sandboxed() const {
    const std::string path = root();
    const Child child(nullptr, [&path] { return chroot(path.c_str()) == 0 && chdir("/") == 0; });
    EXPECT_TRUE(child.isAlive());
    return EntitlementsOfPeer(child.peer(), files);
  }
  void SetUp() override {
    std::filesystem::create_directory(root());
    if (geteuid() != 0) GTEST_SKIP() << "only root can give a process another root";
    write(R"({"applications": [{"flatpak": "org.example.Writer", "entitlements": ["one"]},
                               {"executable": ")" +
          std::filesystem::read_symlink("/proc/self/exe").string() + R"(", "entitlements": ["two"]}]})");
  }
};

TEST_F(SandboxedEntitlementsTest, aFlatpakIsEntitledByItsIdentifierAndByNothingElse) {
  writeInfo("# made by flatpak\n[Instance]\nname=no\n[Application]\nname=org.example.Writer\nruntime=r\n");
  const ProcessEntitlements found = sandboxed();
  EXPECT_FALSE(found.error) << found.error.description();
  EXPECT_EQ(found.application.flatpak, "org.example.Writer");
  EXPECT_TRUE(found.has("one"));
  EXPECT_FALSE(found.has("two")) << "its executable is of the sandbox";
}

TEST_F(SandboxedEntitlementsTest, anotherFlatpakIsNot) {
  writeInfo("[Application]\nname=org.example.Writer2\n");
  EXPECT_TRUE(sandboxed().grants.empty());
}

TEST_F(SandboxedEntitlementsTest, aSandboxThatNamesNoApplicationHasNothing) {
  for (const char *info : {"", "[Application]\n", "[Application]\nname=\n", "name=org.example.Writer\n",
                           "[Instance]\nname=org.example.Writer\n"}) {
    writeInfo(info);
    const ProcessEntitlements found = sandboxed();
    EXPECT_TRUE(found.error) << info;
    EXPECT_TRUE(found.grants.empty()) << info;
  }
}

TEST_F(SandboxedEntitlementsTest, aSandboxWhoseInformationIsALinkHasNothing) {
  std::filesystem::create_symlink("/etc/hostname", root() + "/.flatpak-info");
  EXPECT_TRUE(sandboxed().error);
}

}  // namespace
}  // namespace droxa
