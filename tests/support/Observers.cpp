#include "tests/support/Observers.h"

#include <algorithm>
#include <gtest/gtest.h>
#include <utility>

#include "tests/support/Eventually.h"
#include "tests/support/Once.h"

namespace droxa {

namespace {

using Kind = ObserverCall::Kind;

bool isAnswer(const ObserverCall &call) {
  return call.kind == Kind::finished || call.kind == Kind::failed;
}

std::string joined(const std::vector<std::string> &words) {
  std::string text;
  for (const std::string &word : words) text += (text.empty() ? "" : ", ") + word;
  return text;
}

std::string wordFor(const ObserverCall &call) {
  switch (call.kind) {
    case Kind::didEnumerateItems:
      return "didEnumerateItems(" + std::to_string(call.items.size()) + ")";
    case Kind::didUpdateItems:
      return "didUpdateItems(" + std::to_string(call.items.size()) + ")";
    case Kind::didDeleteItems:
      return "didDeleteItems(" + joined(call.identifiers) + ")";
    case Kind::finished:
      return "finished";
    case Kind::failed:
      return "failed";
  }
  return {};
}

ObserverCall callOf(Kind kind) {
  ObserverCall call;
  call.kind = kind;
  return call;
}

ObserverCall callWithItems(Kind kind, const NSFileProviderItems &items) {
  ObserverCall call = callOf(kind);
  call.items = items;
  return call;
}

ObserverCall finishedWith(const NSData &token, bool moreComing) {
  ObserverCall call = callOf(Kind::finished);
  call.token = token;
  call.moreComing = moreComing;
  return call;
}

ObserverCall failedWith(const NSError &error) {
  ObserverCall call = callOf(Kind::failed);
  call.error = error;
  return call;
}

}  // namespace

ObserverRecord::ObserverRecord(std::string name) : name_(std::move(name)) {}

ObserverRecord::~ObserverRecord() {
  const std::lock_guard<std::mutex> lock(mutex_);
  if (expectsAnswer_ && !answered_) ADD_FAILURE() << name_ << ": released without an answer";
}

void ObserverRecord::expectNoAnswer() {
  const std::lock_guard<std::mutex> lock(mutex_);
  expectsAnswer_ = false;
  if (answered_) ADD_FAILURE() << name_ << ": answered, though nothing was to come";
}

void ObserverRecord::record(ObserverCall call) {
  {
    const std::lock_guard<std::mutex> lock(mutex_);
    if (inCall_) ADD_FAILURE() << name_ << ": " << wordFor(call) << " inside another call";
    if (answered_) ADD_FAILURE() << name_ << ": " << wordFor(call) << " after the answer";
    if (!expectsAnswer_) ADD_FAILURE() << name_ << ": " << wordFor(call) << ", though nothing was to come";
    if (call.kind == Kind::failed && !call.error) ADD_FAILURE() << name_ << ": failed with a nil error";
    calls_.push_back(call);
    inCall_ = true;
  }
  if (hook_) hook_(call);
  const std::lock_guard<std::mutex> lock(mutex_);
  inCall_ = false;
  if (isAnswer(call)) answered_ = true;
  condition_.notify_all();
}

bool ObserverRecord::answered() const {
  const std::lock_guard<std::mutex> lock(mutex_);
  return answered_;
}

void ObserverRecord::waitForAnswer() const {
  std::unique_lock<std::mutex> lock(mutex_);
  if (!condition_.wait_for(lock, kTestDeadline, [this] { return answered_; })) {
    ADD_FAILURE() << name_ << ": no answer before the deadline";
  }
}

std::vector<ObserverCall> ObserverRecord::snapshot() const {
  const std::lock_guard<std::mutex> lock(mutex_);
  return calls_;
}

std::vector<ObserverCall> ObserverRecord::calls() const {
  waitForAnswer();
  return snapshot();
}

std::vector<std::string> ObserverRecord::story() const {
  std::vector<std::string> words;
  for (const ObserverCall &call : calls()) words.push_back(wordFor(call));
  return words;
}

NSFileProviderItems ObserverRecord::items() const {
  NSFileProviderItems all;
  for (const ObserverCall &call : calls()) all.insert(all.end(), call.items.begin(), call.items.end());
  return all;
}

std::vector<std::string> ObserverRecord::itemIdentifiers() const {
  std::vector<std::string> identifiers;
  for (const auto &item : items()) identifiers.push_back(item->itemIdentifier());
  std::sort(identifiers.begin(), identifiers.end());
  return identifiers;
}

std::vector<std::string> ObserverRecord::deletedIdentifiers() const {
  std::vector<std::string> all;
  for (const ObserverCall &call : calls())
    all.insert(all.end(), call.identifiers.begin(), call.identifiers.end());
  return all;
}

ObserverCall ObserverRecord::answer() const {
  for (const ObserverCall &call : calls()) {
    if (isAnswer(call)) return call;
  }
  return callOf(Kind::failed);
}

NSData ObserverRecord::token() const {
  return answer().token;
}
bool ObserverRecord::moreComing() const {
  return answer().moreComing;
}
NSError ObserverRecord::error() const {
  return answer().error;
}

void RecordingEnumerationObserver::didEnumerateItems(const NSFileProviderItems &items) {
  record(callWithItems(Kind::didEnumerateItems, items));
}
void RecordingEnumerationObserver::finishEnumeratingUpToPage(const NSData &nextPage) {
  record(finishedWith(nextPage, false));
}
void RecordingEnumerationObserver::finishEnumeratingWithError(const NSError &error) {
  record(failedWith(error));
}

void RecordingChangeObserver::didUpdateItems(const NSFileProviderItems &items) {
  record(callWithItems(Kind::didUpdateItems, items));
}
void RecordingChangeObserver::didDeleteItemsWithIdentifiers(const std::vector<std::string> &identifiers) {
  ObserverCall call = callOf(Kind::didDeleteItems);
  call.identifiers = identifiers;
  record(std::move(call));
}
void RecordingChangeObserver::finishEnumeratingChangesUpToSyncAnchor(const NSData &anchor, bool moreComing) {
  record(finishedWith(anchor, moreComing));
}
void RecordingChangeObserver::finishEnumeratingWithError(const NSError &error) {
  record(failedWith(error));
}

std::shared_ptr<RecordingEnumerationObserver> listPage(NSFileProviderEnumerator &enumerator,
                                                       const NSData &page) {
  const auto observer = std::make_shared<RecordingEnumerationObserver>();
  enumerator.enumerateItemsForObserver(observer, page);
  observer->waitForAnswer();
  return observer;
}

std::shared_ptr<RecordingChangeObserver> changesSince(NSFileProviderEnumerator &enumerator,
                                                      const NSData &anchor) {
  const auto observer = std::make_shared<RecordingChangeObserver>();
  enumerator.enumerateChangesForObserver(observer, anchor);
  observer->waitForAnswer();
  return observer;
}

NSData currentAnchor(NSFileProviderEnumerator &enumerator) {
  Once<NSData> anchor("current sync anchor");
  enumerator.currentSyncAnchorWithCompletionHandler(anchor.completion());
  return anchor.value<0>();
}

}  // namespace droxa
