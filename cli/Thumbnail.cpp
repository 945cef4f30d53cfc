#include <algorithm>
#include <cerrno>
#include <chrono>
#include <map>
#include <nlohmann/json.hpp>

#include "cli/Commands.h"
#include "cli/ExitStatus.h"
#include "cli/ItemArgument.h"
#include "cli/ItemText.h"
#include "cli/PageReader.h"
#include "cli/PictureFolder.h"
#include "cli/ProgressLine.h"
#include "cli/Text.h"
#include "cli/Waiting.h"
#include "platform/imaging/PNGImage.h"
#include "platform/xpc/NSXPCProxyCreating.h"

namespace droxa {

namespace {

using namespace std::chrono_literals;
using Json = nlohmann::ordered_json;

constexpr auto kLook = 50ms;
constexpr std::size_t kOfOneRequest = 500;

struct Document {
  std::string identifier;
  std::string name;
};

struct Next {
  std::vector<FPDThumbnail> thumbnails;
  bool isLast = false;
};

// What became of the documents, and what is told of it.
class Report {
 public:
  Report(CommandContext &context, const ThumbnailOptions &options) : context_(context), options_(options) {}

  void wrote(const Document &document, const std::string &path, const PNGImage &picture) {
    ++written_;
    if (options_.json) {
      print({{"identifier", document.identifier},
             {"name", document.name},
             {"file", path},
             {"width", picture.width()},
             {"height", picture.height()}});
    } else {
      context_.out << escapedText(document.name) << ": " << escapedText(path) << " (" << picture.width()
                   << " x " << picture.height() << ")\n";
    }
  }
  void hasNone(const Document &document) { tellNone(document, "the cloud has no thumbnail of it"); }
  void failed(const Document &document, const NSError &error) {
    if (status_ == kExitSuccess) status_ = exitStatusForError(error);
    tellNone(document, explanationOfError(error));
  }
  void summarise(std::size_t documents) const {
    if (options_.json) return;
    context_.out << written_ << " of " << countText(documents, "document")
                 << (documents == 1 ? " has" : " have") << " a thumbnail in " << escapedText(options_.folder)
                 << std::endl;
  }
  int status() const { return status_; }

 private:
  void tellNone(const Document &document, const std::string &why) {
    if (options_.json) {
      print(
          {{"identifier", document.identifier}, {"name", document.name}, {"file", nullptr}, {"reason", why}});
    } else {
      context_.out << escapedText(document.name) << ": no thumbnail: " << why << '\n';
    }
  }
  void print(const Json &object) {
    context_.out << object.dump(-1, ' ', false, Json::error_handler_t::replace) << '\n';
  }

  CommandContext &context_;
  const ThumbnailOptions &options_;
  std::size_t written_ = 0;
  int status_ = kExitSuccess;
};

// The documents that the arguments stand for, each once.
class Documents {
 public:
  explicit Documents(CommandContext &context) : context_(context) {}

  int add(const std::string &argument) {
    const auto found = resolveContainer(*context_.host, argument);
    if (found.error) return reportError(context_, argument, found.error);
    const auto &item = found.value.item;
    if (item && item->fields().kind != NSFileProviderItemKind::folder) {
      addItem(*item);
      return kExitSuccess;
    }
    return addFolder(argument, found.value.identifier);
  }
  const std::vector<Document> &all() const { return documents_; }

 private:
  void addItem(const NSFileProviderItem &item) {
    const std::string &identifier = item.itemIdentifier();
    if (known_.try_emplace(identifier, true).second)
      documents_.push_back({identifier, item.fields().filename});
  }
  int addFolder(const std::string &argument, const std::string &identifier) {
    const auto enumerator = context_.host->enumerator(identifier);
    if (!enumerator.value) return reportError(context_, argument, enumerator.error);
    PageReader reader(*context_.host, enumerator.value, NSFileProviderInitialPageSortedByName());
    for (;;) {
      const auto next = reader.nextItem();
      if (next.error) return reportError(context_, argument, next.error);
      if (!next.value) return kExitSuccess;
      if (next.value->fields().kind == NSFileProviderItemKind::document) addItem(*next.value);
    }
  }

  CommandContext &context_;
  std::vector<Document> documents_;
  std::map<std::string, bool> known_;
};

// Fetches and writes the thumbnails of some documents after the other.
class Fetching {
 public:
  Fetching(CommandContext &context, const ThumbnailOptions &options, const std::vector<Document> &documents)
      : context_(context),
        options_(options),
        documents_(documents),
        folder_(options.folder),
        report_(context, options),
        line_(context, "thumbnails") {}

  int run() {
    if (const NSError error = folder_.make()) return reportError(context_, options_.folder, error);
    for (std::size_t first = 0; first < documents_.size(); first += kOfOneRequest) {
      const int status = request(first, std::min(first + kOfOneRequest, documents_.size()));
      if (status != kExitSuccess) return status;
    }
    report_.summarise(documents_.size());
    return report_.status();
  }

 private:
  int request(std::size_t first, std::size_t end) {
    std::map<std::string, const Document *> asked;
    std::vector<std::string> identifiers;
    for (std::size_t i = first; i < end; ++i) {
      identifiers.push_back(documents_[i].identifier);
      asked[documents_[i].identifier] = &documents_[i];
    }
    const double side = options_.size;
    const auto begun = context_.host->fetchThumbnails(identifiers, {side, side});
    if (!begun.value) return reportError(context_, "thumbnails", begun.error);
    for (;;) {
      const auto next = nextOf(begun.value);
      if (!next) return kExitInterrupted;
      if (next->error && next->value.thumbnails.empty() && !next->value.isLast)
        return reportError(context_, "thumbnails", next->error);
      line_.clear();
      for (const FPDThumbnail &thumbnail : next->value.thumbnails) {
        const auto found = asked.find(thumbnail.identifier);
        if (found != asked.end()) write(*found->second, thumbnail);
      }
      if (next->value.isLast) return kExitSuccess;
      showProgress();
    }
  }

  // nullopt: cancelled.
  std::optional<CallResult<Next>> nextOf(const std::shared_ptr<FPDThumbnails> &thumbnails) {
    const auto slot = std::make_shared<AnswerSlot<Next>>();
    NSXPCProxyWithErrorHandler<FPDThumbnails>(thumbnails, [slot](const NSError &error) {
      slot->put({{}, error});
    })->nextWithReply([slot](const std::vector<FPDThumbnail> &some, bool isLast, const NSError &error) {
      slot->put({{some, isLast}, error});
    });
    for (;;) {
      if (auto next = slot->waitFor(kLook)) return next;
      if (!context_.waitForStop(0ms)) continue;
      line_.clear();
      NSXPCProxyWithErrorHandler<FPDThumbnails>(thumbnails, [](const NSError &) {})->cancel();
      context_.err << "droxa: cancelled; what was written stays" << std::endl;
      return std::nullopt;
    }
  }

  void write(const Document &document, const FPDThumbnail &thumbnail) {
    ++done_;
    if (!thumbnail.imageData) {
      return thumbnail.error ? report_.failed(document, thumbnail.error) : report_.hasNone(document);
    }
    NSError error;
    const auto picture = PNGImage::read(thumbnail.imageData, &error);
    if (!picture) return report_.failed(document, error);
    const PNGImage scaled = picture->scaledToFit(options_.size);
    const std::string path = folder_.write(document.name, scaled.file(), &error);
    if (error) return report_.failed(document, error);
    report_.wrote(document, path, scaled);
  }

  void showProgress() {
    if (!context_.isTerminal) return;
    line_.show(static_cast<double>(done_) / static_cast<double>(documents_.size()),
               std::to_string(done_) + " of " + std::to_string(documents_.size()));
  }

  CommandContext &context_;
  const ThumbnailOptions &options_;
  const std::vector<Document> &documents_;
  const PictureFolder folder_;
  Report report_;
  ProgressLine line_;
  std::size_t done_ = 0;
};

// What was begun goes on when the command is stopped.
int fillCache(CommandContext &context, const ThumbnailOptions &options) {
  int status = kExitSuccess;
  for (const std::string &argument : options.arguments) {
    const auto found = resolveContainer(*context.host, argument);
    NSError error = found.error;
    const auto &item = found.value.item;
    if (!error && item && item->fields().kind != NSFileProviderItemKind::folder)
      error = NSError::errorWithPOSIXCode(ENOTDIR, "only a folder's can be put into the cache");
    bool wasStopped = false;
    if (!error)
      error = context.host->fillDesktopThumbnails(found.value.identifier, context.waitForStop, &wasStopped);
    if (wasStopped) return kExitInterrupted;
    const int one = error ? reportError(context, argument, error) : kExitSuccess;
    if (status == kExitSuccess) status = one;
  }
  return status;
}

}  // namespace

int runThumbnail(CommandContext &context, const ThumbnailOptions &options) {
  if (options.fillsCache) return fillCache(context, options);
  Documents documents(context);
  int status = kExitSuccess;
  for (const std::string &argument : options.arguments) {
    const int one = documents.add(argument);
    if (status == kExitSuccess) status = one;
  }
  const int fetched = Fetching(context, options, documents.all()).run();
  return fetched == kExitSuccess ? status : fetched;
}

}  // namespace droxa
