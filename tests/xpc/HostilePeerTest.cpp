#include <algorithm>
#include <array>
#include <cstring>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/socket.h>
#include <unistd.h>

#include "platform/fileprovider/xpc/FileProviderInterfaces.h"
#include "platform/oslog/os_log.h"
#include "tests/xpc/CallOutcomes.h"
#include "tests/xpc/ConnectedPair.h"
#include "tests/xpc/Descriptors.h"
#include "tests/xpc/ScriptedHost.h"

// A peer that sends what it likes loses its connection, and nobody else notices.

namespace droxa {
namespace {

using Host = NSFileProviderHostProtocol;

// A connection that serves a host, and the bare socket at its other end.
struct BarePeer {
  std::shared_ptr<NSXPCConnection> connection;
  CallOutcomes outcomes;
  int socket = -1;

  BarePeer() {
    int ends[2] = {-1, -1};
    EXPECT_EQ(socketpair(AF_UNIX, SOCK_STREAM, 0, ends), 0);
    connection = NSXPCConnection::connectionWithDescriptor(ends[0]);
    connection->setExportedObject<Host>(NSFileProviderHostInterface(), ScriptedHost::answering());
    connection->setRemoteObjectInterface(NSFileProviderHostInterface());
    outcomes.follow(connection);
    connection->resume();
    socket = ends[1];
  }
  BarePeer(const BarePeer &) = delete;
  BarePeer &operator=(const BarePeer &) = delete;
  ~BarePeer() {
    connection->invalidate();
    close(socket);
  }
  void send(const void *bytes, std::size_t size) const {
    EXPECT_EQ(::send(socket, bytes, size, MSG_NOSIGNAL), static_cast<ssize_t>(size));
  }
  bool waitForEnd() const { return outcomes.waitForLast("invalidation"); }
};

std::string droppedBecause(const std::string &why) {
  return "[ERROR] the connection with process " + std::to_string(getpid()) + " is dropped: " + why;
}

bool logged(const OSLogCapture &log, const std::string &text) {
  const auto lines = log.lines();
  return std::any_of(lines.begin(), lines.end(), [&](const OSLogLine &line) {
    return line.text == text && line.type == os_log_type_t::error;
  });
}

class HostilePeer : public testing::Test {
 protected:
  HostilePeer() { bystander_.serve<Host>(NSFileProviderHostInterface(), ScriptedHost::answering()); }
  ~HostilePeer() override {
    CallOutcomes outcomes;
    outcomes.call(bystander_.client, "");
    EXPECT_TRUE(outcomes.waitForAll());
    EXPECT_EQ(outcomes.replies(), 1) << "somebody else noticed";
  }
  ConnectedPair bystander_;
  const OSLogCapture log_;
};

TEST_F(HostilePeer, garbageEndsTheConnection) {
  const BarePeer peer;
  std::array<unsigned char, 4096> garbage = {};
  for (std::size_t index = 0; index < garbage.size(); ++index) {
    garbage[index] = static_cast<unsigned char>(index * 131 + 7);
  }
  peer.send(garbage.data(), garbage.size());
  EXPECT_TRUE(peer.waitForEnd());
  EXPECT_TRUE(logged(log_, droppedBecause("it sent what makes no sense")));
}

TEST_F(HostilePeer, aHugeMessageSizeEndsTheConnection) {
  const BarePeer peer;
  const std::uint32_t header[] = {0, 0x7fffffff};  // one segment of 16 GiB
  peer.send(header, sizeof header);
  EXPECT_TRUE(peer.waitForEnd());
  EXPECT_TRUE(logged(log_, droppedBecause("it sent what makes no sense")));
}

TEST_F(HostilePeer, tooManySegmentsEndTheConnection) {
  const BarePeer peer;
  const std::uint32_t header[] = {0xfffffffe, 1};
  peer.send(header, sizeof header);
  EXPECT_TRUE(peer.waitForEnd());
}

TEST_F(HostilePeer, aWellFramedMessageThatIsNoneEndsTheConnection) {
  const BarePeer peer;
  const std::uint64_t message[] = {std::uint64_t{2} << 32, 0xffffffffffffffff, 0xffffffffffffffff};
  peer.send(message, sizeof message);
  EXPECT_TRUE(peer.waitForEnd());
}

TEST_F(HostilePeer, halfAMessageAndAnEndIsAnInterruption) {
  const BarePeer peer;
  const std::uint32_t header[] = {0, 100};
  peer.send(header, sizeof header);
  shutdown(peer.socket, SHUT_RDWR);
  EXPECT_TRUE(peer.waitForEnd());
  EXPECT_FALSE(log_.contains("is dropped"));
}

TEST_F(HostilePeer, callsThatWaitForAGarbageSenderFail) {
  BarePeer peer;
  for (int call = 0; call < 10; ++call) peer.outcomes.call(peer.connection, "");
  const std::array<unsigned char, 64> garbage = {0xff, 0xff, 0xff, 0xff};
  peer.send(garbage.data(), garbage.size());
  EXPECT_TRUE(peer.waitForEnd());
  peer.outcomes.expectEachEndedOnce();
}

// A request for the exported object, the smallest message that is always in order.
std::array<std::uint64_t, 6> bootstrapMessage(std::uint32_t question) {
  constexpr std::uint64_t oneWordOnePointer = (std::uint64_t{1} << 32) | (std::uint64_t{1} << 48);
  return {std::uint64_t{5} << 32, oneWordOnePointer, 8, oneWordOnePointer, question, 0};
}

void sendWithDescriptors(int socket, const std::array<std::uint64_t, 6> &message, int descriptor) {
  auto bytes = message;
  iovec piece = {bytes.data(), sizeof bytes};
  alignas(cmsghdr) std::array<char, CMSG_SPACE(2 * sizeof(int))> control = {};
  msghdr header = {};
  header.msg_iov = &piece;
  header.msg_iovlen = 1;
  header.msg_control = control.data();
  header.msg_controllen = control.size();
  cmsghdr *const rights = CMSG_FIRSTHDR(&header);
  rights->cmsg_level = SOL_SOCKET;
  rights->cmsg_type = SCM_RIGHTS;
  rights->cmsg_len = CMSG_LEN(2 * sizeof(int));
  const int both[] = {descriptor, descriptor};
  std::memcpy(CMSG_DATA(rights), both, sizeof both);
  sendmsg(socket, &header, MSG_NOSIGNAL);  // fails once the connection is gone
}

TEST_F(HostilePeer, tooManyDescriptorsEndTheConnectionAndAreClosed) {
  const std::size_t before = openDescriptors();
  {
    const BarePeer peer;
    const int descriptor = open("/dev/null", O_RDONLY | O_CLOEXEC);
    for (std::uint32_t question = 0; question < 40; ++question) {
      sendWithDescriptors(peer.socket, bootstrapMessage(question), descriptor);
    }
    close(descriptor);
    EXPECT_TRUE(peer.waitForEnd());
    EXPECT_TRUE(logged(log_, droppedBecause("it sent more than 64 descriptors")));
  }
  EXPECT_TRUE(eventually([before] { return openDescriptors() <= before; }));
}

TEST_F(HostilePeer, tooManyUnansweredCallsEndTheConnection) {
  ConnectedPair pair;
  const auto host = std::make_shared<SilentHost>();
  pair.serve<Host>(NSFileProviderHostInterface(), host);
  CallOutcomes outcomes;
  for (int call = 0; call < 16'500; ++call) outcomes.call(pair.client, "");
  EXPECT_TRUE(outcomes.waitForAll());
  outcomes.expectEachEndedOnce();
  EXPECT_EQ(outcomes.replies(), 0);
  EXPECT_TRUE(logged(log_, droppedBecause("it has 16384 calls unanswered")));
}

TEST_F(HostilePeer, aPeerThatDoesntReadIsCutOff) {
  BarePeer peer;
  const std::string large(1U << 20, 'x');
  for (int call = 0; call < 80; ++call) peer.outcomes.call(peer.connection, large);
  EXPECT_TRUE(peer.outcomes.waitForAll());
  EXPECT_TRUE(peer.outcomes.waitFor("invalidation"));  // calls made after it fail too
  peer.outcomes.expectEachEndedOnce();
  EXPECT_TRUE(logged(log_, droppedBecause("it doesn't read what is written to it")));
}

TEST_F(HostilePeer, connectionsLeaveNoDescriptorsBehind) {
  const std::size_t before = openDescriptors();
  for (int round = 0; round < 50; ++round) {
    ConnectedPair pair;
    pair.serve<Host>(NSFileProviderHostInterface(), ScriptedHost::answering());
    CallOutcomes outcomes;
    outcomes.call(pair.client, "");
    EXPECT_TRUE(outcomes.waitForAll());
  }
  EXPECT_TRUE(eventually([before] { return openDescriptors() <= before; }));
}

}  // namespace
}  // namespace droxa
