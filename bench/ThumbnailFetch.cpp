// The extension's fetch of a folder's thumbnails out of two zones, beside a plain reading of the same assets
// from the cloud database, by turns in one process.
//   bench_thumbnail_fetch FOLDER [DOCUMENTS] [KILOBYTES OF A THUMBNAIL]
#include <algorithm>
#include <atomic>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <future>
#include <random>
#include <sys/mman.h>
#include <unistd.h>

#include "extension/QVFileProviderExtension.h"
#include "platform/cloudkit/CKContainer.h"
#include "platform/cloudkit/EmbeddedCloud.h"
#include "platform/foundation/Paths.h"
#include "platform/oslog/os_log.h"
#include "tessaly/QVRecordKeys.h"
#include "tessaly/QVUbiquitousCloudKitContainer.h"
#include "tessaly/QVUserDefaults.h"
#include "tests/support/FakeDaemonConnection.h"
#include "tests/support/FaultyCloud.h"

namespace {

using namespace droxa;
using Clock = std::chrono::steady_clock;

constexpr int kRounds = 7;
constexpr std::size_t kRecordsOfOneCall = 200;

[[noreturn]] void fail(const std::string &what) {
  std::fprintf(stderr, "bench_thumbnail_fetch: %s\n", what.c_str());
  std::exit(1);
}

CKAsset upload(CKCloud &cloud, std::mt19937_64 &random, std::size_t kilobytes) {
  std::vector<std::uint64_t> words(kilobytes * 1024 / sizeof(std::uint64_t));
  for (std::uint64_t &word : words) word = random();
  const int file = memfd_create("thumbnail", MFD_CLOEXEC);
  const std::size_t size = words.size() * sizeof(std::uint64_t);
  if (write(file, words.data(), size) != static_cast<ssize_t>(size)) fail("can't make a thumbnail");
  CKUploadReply reply = cloud.uploadAsset(file, size, {}, {});
  close(file);
  if (reply.error) fail(reply.error.description());
  return reply.asset;
}

struct Drive {
  std::vector<std::string> identifiers;
  std::map<QVFileObjectID, CKRecordID> recordIDs;
};

Drive makeDrive(CKCloud &cloud, FakeDaemon &daemon, int documents, std::size_t kilobytes) {
  std::mt19937_64 random(1);
  const CKRecordZoneID zones[] = {{"one"}, {"two"}};
  for (const CKRecordZoneID &zone : zones)
    if (const NSError error = cloud.saveZone(zone, {})) fail(error.description());
  Drive drive;
  for (int i = 0; i < documents; ++i) {
    CKRecord record;
    record.recordType = "item";
    record.recordID = {"record" + std::to_string(i), zones[i % 2]};
    record.fields[kQVRecordKeySize] = std::int64_t{1} << 20;
    record.fields[kQVRecordKeyThumbnail1024x1024] = upload(cloud, random, kilobytes);
    const CKModifyReply reply = cloud.modifyRecords({{record}, {}}, {});
    if (reply.error) fail(reply.error.description());
    const QVFileObjectID identifier = daemon.addDatalessDocument("p" + std::to_string(i) + ".jpg", 1 << 20);
    drive.identifiers.push_back(identifier.asString());
    drive.recordIDs[identifier] = record.recordID;
  }
  FakeSharing::Answers answers;
  answers.recordIDs = drive.recordIDs;
  daemon.sharing().setAnswers(answers);
  return drive;
}

// Every record's asset, read into memory, with as many records a call as the extension asks for.
std::size_t readPlainly(CKCloud &cloud, const Drive &drive) {
  std::size_t bytes = 0;
  std::vector<CKRecordID> ids;
  for (const auto &entry : drive.recordIDs) ids.push_back(entry.second);
  for (std::size_t first = 0; first < ids.size(); first += kRecordsOfOneCall) {
    const auto from = ids.begin() + static_cast<std::ptrdiff_t>(first);
    const auto to =
        ids.begin() + static_cast<std::ptrdiff_t>(std::min(first + kRecordsOfOneCall, ids.size()));
    const CKFetchReply reply = cloud.fetchRecords({from, to}, {{kQVRecordKeyThumbnail1024x1024}}, {});
    for (const CKRecordResult &result : reply.results) {
      const auto *asset = result.record.get<CKAsset>(kQVRecordKeyThumbnail1024x1024);
      if (!asset) fail("a record without its thumbnail");
      std::string contents;
      const NSError error =
          cloud.readAsset(asset->reference(), 0,
                          [&contents](std::span<const std::uint8_t> some) {
                            contents.append(reinterpret_cast<const char *>(some.data()), some.size());
                            return NSError();
                          },
                          {}, {});
      if (error) fail(error.description());
      bytes += contents.size();
    }
  }
  return bytes;
}

std::size_t fetch(QVFileProviderExtension &extension, const Drive &drive) {
  std::atomic<std::size_t> bytes{0}, count{0};
  std::promise<NSError> done;
  extension.fetchThumbnailsForItemIdentifiers(
      drive.identifiers, {256, 256},
      [&](const std::string &, const NSData &data, const std::optional<std::string> &, const NSError &) {
        bytes += data.length();
        ++count;
      },
      [&done](const NSError &error) { done.set_value(error); });
  if (const NSError error = done.get_future().get()) fail(error.description());
  if (count != drive.identifiers.size()) fail("not every item was answered");
  return bytes;
}

template <class Work>
double milliseconds(const Work &work) {
  const auto begin = Clock::now();
  work();
  return std::chrono::duration<double, std::milli>(Clock::now() - begin).count();
}

int run(const std::string &folder, int documents, std::size_t kilobytes) {
  DroxaSetProcessHome(DroxaHome(folder));
  std::string problem;
  if (!DroxaProcessHome().create(&problem)) fail(problem);
  OSLogSetThreshold(os_log_type_t::fault);
  NSError error;
  const auto embedded = EmbeddedCloud::open(folder + "/cloud", "bench", "bench", &error);
  if (!embedded) fail(error.description());
  const FakeDaemonScope fake;
  const Drive drive = makeDrive(*embedded, *fake.daemon, documents, kilobytes);
  const auto extension = QVFileProviderExtension::init();
  const auto counted = std::make_shared<FaultyCloud>(embedded);
  CKContainer::registerContainer(QVUbiquitousCloudKitContainerIdentifier,
                                 [counted](NSError *) { return counted; });

  double plain = 1e9, fetched = 1e9;
  std::size_t plainBytes = 0, bytes = 0;
  for (int round = 0; round < kRounds; ++round) {
    plain = std::min(plain, milliseconds([&] { plainBytes = readPlainly(*embedded, drive); }));
    fetched = std::min(fetched, milliseconds([&] { bytes = fetch(*extension, drive); }));
  }
  const auto limit = QVUserDefaults::standardUserDefaults().maxRecordCountInFetchRecordsOperation();
  std::printf("%d thumbnails of %zu KiB in two zones, the fastest of %d rounds each\n", documents, kilobytes,
              kRounds);
  std::printf("plain reading %.1f ms, %zu bytes; the extension %.1f ms, %zu bytes; ratio %.2f\n", plain,
              plainBytes, fetched, bytes, fetched / plain);
  std::printf("operations of at most %lld records: %d a fetch\n", static_cast<long long>(limit),
              counted->count(FaultyCloud::Call::fetchRecords) / kRounds);
  return 0;
}

}  // namespace

int main(int argc, char **argv) {
  if (argc < 2) fail("usage: bench_thumbnail_fetch FOLDER [DOCUMENTS] [KILOBYTES OF A THUMBNAIL]");
  const int documents = argc > 2 ? std::atoi(argv[2]) : 1000;
  const int kilobytes = argc > 3 ? std::atoi(argv[3]) : 64;
  if (documents < 1 || kilobytes < 1) fail("numbers are 1 or more");
  return run(argv[1], documents, static_cast<std::size_t>(kilobytes));
}
