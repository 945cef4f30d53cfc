#pragma once

#include <functional>
#include <memory>
#include <tuple>
#include <utility>

#include "tessaly/QVPersona.h"

namespace droxa {

// A completion on its way to being called, under the persona under which this was made. It is called in any
// case: a persona that can't be adopted keeps the block that was remembered under it from running, and then
// it runs under the calling thread's.
// Thread contract: made on any thread; deliver() once, on any thread.
template <class... Values>
class QVRememberedCompletion {
 public:
  using Completion = std::function<void(const Values &...)>;

  explicit QVRememberedCompletion(Completion completion) : completion_(std::move(completion)) {
    if (qvc_block_remember_persona) underPersona_ = qvc_block_remember_persona([this] { call(); });
  }
  QVRememberedCompletion(const QVRememberedCompletion &) = delete;
  QVRememberedCompletion &operator=(const QVRememberedCompletion &) = delete;

  void deliver(const std::tuple<Values...> &outcome) {
    outcome_ = outcome;
    if (underPersona_) underPersona_();
    call();
  }

 private:
  void call() {
    if (const Completion once = std::exchange(completion_, nullptr)) std::apply(once, outcome_);
  }

  Completion completion_;
  std::tuple<Values...> outcome_;
  QVBlock underPersona_;
};

}  // namespace droxa
