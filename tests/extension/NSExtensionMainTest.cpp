#include <cerrno>
#include <fcntl.h>
#include <signal.h>
#include <spawn.h>
#include <sstream>
#include <sys/socket.h>
#include <sys/wait.h>
#include <unistd.h>

#include "platform/fileprovider/NSFileProviderError.h"
#include "platform/fileprovider/NSFileProviderRemote.h"
#include "platform/fileprovider/xpc/FileProviderInterfaces.h"
#include "platform/xpc/NSXPCConnection.h"
#include "tests/extension/ExtensionFixture.h"
#include "tests/support/Eventually.h"
#include "tests/support/Once.h"

namespace droxa {
namespace {

// The extension's program, started by the test as its host. Killed at the end if it still runs.
class ExtensionProgram : public testing::Test {
 protected:
  ~ExtensionProgram() override {
    if (connection) connection->invalidate();
    if (process > 0) {
      kill(process, SIGKILL);
      waitpid(process, nullptr, 0);
    }
  }

  // Starts it with these arguments; with `socket`, as descriptor 3.
  void spawn(std::vector<std::string> arguments, int socket = -1) {
    arguments.insert(arguments.begin(), DROXA_FILE_PROVIDER_PROGRAM);
    std::vector<char *> pointers;
    for (std::string &argument : arguments) pointers.push_back(argument.data());
    pointers.push_back(nullptr);
    posix_spawn_file_actions_t actions;
    posix_spawn_file_actions_init(&actions);
    posix_spawn_file_actions_addopen(&actions, 1, outputPath().c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0600);
    posix_spawn_file_actions_adddup2(&actions, 1, 2);
    if (socket >= 0) posix_spawn_file_actions_adddup2(&actions, socket, 3);
    ASSERT_EQ(posix_spawn(&process, pointers[0], &actions, nullptr, pointers.data(), environ), 0);
    posix_spawn_file_actions_destroy(&actions);
  }
  // Starts it as the host does, with a connection that isn't resumed yet.
  void startServing() {
    int sockets[2];
    ASSERT_EQ(socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, sockets), 0);
    spawn({"--home", home.path(), "--host-descriptor", "3"}, sockets[1]);
    close(sockets[1]);
    connection = NSXPCConnection::connectionWithDescriptor(sockets[0]);
    connection->setRemoteObjectInterface(NSFileProviderExtensionInterface());
    connection->resume();
  }
  // What the program says of an item that nobody has: the answer shows that it serves.
  NSError errorOfAnItem() {
    const Once<std::shared_ptr<const NSFileProviderItem>, NSError> item("item");
    connection
        ->remoteObjectProxyWithErrorHandler<NSFileProviderExtensionProtocol>(
            [answer = item.completion()](const NSError &error) { answer(nullptr, error); })
        ->itemForIdentifier("d1", item.completion());
    return item.value<1>();
  }
  // Its exit status; -1 when it doesn't end by itself.
  int exitStatus() {
    int status = 0;
    pid_t ended = 0;
    eventually([&] { return (ended = waitpid(process, &status, WNOHANG)) != 0; });
    if (ended != process) return -1;
    process = 0;
    return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
  }
  std::string output() const {
    std::ostringstream text;
    text << std::ifstream(outputPath()).rdbuf();
    return text.str();
  }
  std::string outputPath() const { return home.path() + "/output"; }

  const TemporaryHome home;
  pid_t process = 0;
  std::shared_ptr<NSXPCConnection> connection;
};

TEST_F(ExtensionProgram, servesAndEndsWhenTheHostGoesAway) {
  startServing();
  EXPECT_TRUE(errorOfAnItem().is(NSFileProviderErrorDomain, NSFileProviderErrorNotAuthenticated));
  connection->invalidate();
  EXPECT_EQ(exitStatus(), 0);
}

TEST_F(ExtensionProgram, endsOnSIGTERM) {
  startServing();
  EXPECT_TRUE(errorOfAnItem().is(NSFileProviderErrorDomain, NSFileProviderErrorNotAuthenticated));
  kill(process, SIGTERM);
  EXPECT_EQ(exitStatus(), 0);
}

TEST_F(ExtensionProgram, endsWhenTheHostWasGoneFromTheStart) {
  int sockets[2];
  ASSERT_EQ(socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, sockets), 0);
  close(sockets[0]);
  spawn({"--home", home.path(), "--host-descriptor=3"}, sockets[1]);
  close(sockets[1]);
  EXPECT_EQ(exitStatus(), 0);
}

TEST_F(ExtensionProgram, itsReplacementEndsItWithStatusOne) {
  std::filesystem::create_directories(home.flags() + "/DroxaDrive");
  std::ofstream(home.flags() + "/DroxaDrive/FPFS_Return") << "1";
  startServing();
  EXPECT_EQ(exitStatus(), 1);
}

TEST_F(ExtensionProgram, personasThatMakeNoSenseAreRefusedByName) {
  std::ofstream(home.configuration() + "/personas.json") << "nonsense";
  startServing();
  EXPECT_EQ(exitStatus(), 78);
  EXPECT_NE(output().find("personas.json"), std::string::npos) << output();
}

TEST_F(ExtensionProgram, wrongArgumentsAreNamed) {
  spawn({"--home", home.path()});
  EXPECT_EQ(exitStatus(), 2);
  EXPECT_EQ(
      output(),
      "droxa-file-provider: --host-descriptor is missing: this program is started by fileproviderd, not by "
      "hand\n");
}

TEST_F(ExtensionProgram, helpIsGiven) {
  spawn({"--help"});
  EXPECT_EQ(exitStatus(), 0);
  EXPECT_EQ(output().find("usage: droxa-file-provider"), 0u) << output();
}

}  // namespace
}  // namespace droxa
