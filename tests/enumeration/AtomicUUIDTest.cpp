#include <atomic>
#include <gtest/gtest.h>
#include <thread>
#include <vector>

#include "enumeration/AtomicUUID.h"

namespace droxa {
namespace {

UUID uuidOfBytes(std::uint8_t byte) {
  UUID uuid;
  uuid.bytes.fill(byte);
  return uuid;
}

bool isOfOneByte(const UUID &uuid) {
  return uuid == uuidOfBytes(uuid.bytes[0]);
}

TEST(AtomicUUID, isAllZerosAtFirst) {
  EXPECT_EQ(AtomicUUID().load(), uuidOfBytes(0));
}

TEST(AtomicUUID, givesBackWhatWasStoredLast) {
  AtomicUUID uuid;
  uuid.store(uuidOfBytes(1));
  const UUID random = UUID::generate();
  uuid.store(random);
  EXPECT_EQ(uuid.load(), random);
}

TEST(AtomicUUID, isNeverReadHalfOld) {
  AtomicUUID uuid;
  std::atomic<bool> done{false};
  std::atomic<int> torn{0};
  std::vector<std::thread> readers;
  for (int i = 0; i < 2; ++i) {
    readers.emplace_back([&] {
      while (!done) torn += isOfOneByte(uuid.load()) ? 0 : 1;
    });
  }
  for (int i = 0; i < 20000; ++i) uuid.store(uuidOfBytes(static_cast<std::uint8_t>(i)));
  done = true;
  for (std::thread &reader : readers) reader.join();
  EXPECT_EQ(torn, 0);
}

}  // namespace
}  // namespace droxa
