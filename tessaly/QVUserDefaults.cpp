#include "tessaly/QVUserDefaults.h"

#include <memory>
#include <nlohmann/json.hpp>
#include <string>
#include <vector>

#include "platform/foundation/Paths.h"
#include "platform/foundation/ThreadSafety.h"
#include "tessaly/QVConfigurationFile.h"
#include "tessaly/QVLog.h"

namespace droxa {

namespace {

// Every set of values that was ever read is kept, so that references to an older one stay good.
Mutex gMutex;
std::vector<std::unique_ptr<const QVUserDefaults>> gRead GUARDED_BY(gMutex);
const QVUserDefaults *gCurrent GUARDED_BY(gMutex) = nullptr;

void take(const nlohmann::json &object, const std::string &path, const char *key, std::int64_t lowest,
          std::int64_t highest, std::int64_t &value) {
  const auto found = object.find(key);
  if (found == object.end()) return;
  const bool isNumber = found->is_number_integer() &&
                        (!found->is_number_unsigned() || found->get<std::uint64_t>() <= INT64_MAX);
  if (isNumber && found->get<std::int64_t>() >= lowest && found->get<std::int64_t>() <= highest) {
    value = found->get<std::int64_t>();
    return;
  }
  os_log(qvc_default_log(), "[WARNING] %s: %s must be a whole number from %lld to %lld; %lld is used", path,
         key, lowest, highest, value);
}

}  // namespace

QVUserDefaults::QVUserDefaults() {
  const std::string path = DroxaProcessHome().configuration() + "/defaults.json";
  NSError error;
  const std::optional<std::string> text = QVConfigurationFileRead(path, &error);
  const nlohmann::json object = nlohmann::json::parse(text.value_or("{}"));
  if (error)
    os_log(qvc_default_log(), "[WARNING] %s; the built-in defaults are used", error.localizedDescription());
  if (!object.is_object()) return;
  take(object, path, "maxRecordCountInFetchRecordsOperation", 1, 1'000'000,
       maxRecordCountInFetchRecordsOperation_);
  take(object, path, "minFileSizeForThumbnailTransfer", 0, INT64_MAX, minFileSizeForThumbnailTransfer_);
  take(object, path, "daemonCallDeadlineMilliseconds", 1, 86'400'000, daemonCallDeadlineMilliseconds_);
}

const QVUserDefaults &QVUserDefaults::standardUserDefaults() {
  const Lock lock(gMutex);
  if (!gCurrent) {
    gRead.push_back(std::unique_ptr<const QVUserDefaults>(new QVUserDefaults()));
    gCurrent = gRead.back().get();
  }
  return *gCurrent;
}

void QVUserDefaults::forget() {
  const Lock lock(gMutex);
  gCurrent = nullptr;
}

}  // namespace droxa
