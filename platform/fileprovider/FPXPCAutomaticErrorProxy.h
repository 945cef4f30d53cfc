#pragma once

#include <atomic>
#include <functional>
#include <memory>
#include <string>
#include <tuple>
#include <type_traits>
#include <utility>

#include "platform/foundation/NSError.h"
#include "platform/xpc/NSXPCProxyCreating.h"

namespace droxa {

// What is left of an error that may hold what its receiver isn't to learn: errors of the domains that every
// client of the framework knows stay, any other becomes NSFileProviderErrorServerUnreachable.
NSError FPSanitizedError(const NSError &error);
// Logs that the connection `name` failed under a call; `requestPid` is the process that made it, 0: this one.
void FPLogConnectionFailure(const std::string &name, int requestPid, const NSError &error);

// Makes calls of a remote object whose replies take an error as their last value: where a call fails with its
// connection, its reply is called with that error, and nothing in its other positions. So a reply is called
// exactly once, whatever happens.
//
//   proxy.call(&QVProtocol::getURLForItemIdentifier, reply, identifier);
//
// Thread contract: any thread; a reply is called where the connection calls replies and error handlers.
template <class Protocol>
class FPXPCAutomaticErrorProxy {
 public:
  // The way to the remote object: gives a proxy whose failures go to the handler.
  using Connection = std::function<std::shared_ptr<Protocol>(NSXPCErrorHandler handler)>;

  // `orError` (may be null) is told each failure of the connection before the reply is.
  FPXPCAutomaticErrorProxy(Connection connection, NSXPCErrorHandler orError, std::string name, int requestPid)
      : connection_(std::move(connection)),
        orError_(std::move(orError)),
        name_(std::move(name)),
        requestPid_(requestPid) {}
  virtual ~FPXPCAutomaticErrorProxy() = default;

  // Calls `method` with the arguments and, after them, the reply.
  template <class Class, class... Parameters, class... Values, class... Arguments>
  void call(void (Class::*method)(Parameters...), const std::function<void(Values...)> &reply,
            Arguments &&...arguments) const {
    static_assert(std::is_base_of_v<Class, Protocol>);
    const auto answer = std::make_shared<Answer<Values...>>(reply, sanitizeErrors());
    const auto remote = connection_(
        [answer, orError = orError_, name = name_, requestPid = requestPid_](const NSError &error) {
          if (!answer->claim()) return;
          FPLogConnectionFailure(name, requestPid, error);
          if (orError) orError(error);
          answer->fail(error);
        });
    ((*remote).*method)(std::forward<Arguments>(arguments)...,
                        std::function<void(Values...)>([answer](Values... values) {
                          if (answer->claim()) answer->give(values...);
                        }));
  }

 protected:
  // Whether errors that come back are replaced by what their receiver may see (FPSanitizedError).
  virtual bool sanitizeErrors() const { return true; }

 private:
  // One call's reply, given by whoever claims it first.
  template <class... Values>
  class Answer {
   public:
    using Tuple = std::tuple<std::decay_t<Values>...>;
    static constexpr std::size_t kError = sizeof...(Values) - 1;
    static_assert(std::is_same_v<std::tuple_element_t<kError, Tuple>, NSError>,
                  "the last value of a reply is its error");

    Answer(std::function<void(Values...)> reply, bool sanitizes)
        : reply_(std::move(reply)), sanitizes_(sanitizes) {}
    bool claim() { return !claimed_.test_and_set(); }
    void give(const std::decay_t<Values> &...values) {
      Tuple all(values...);
      if (sanitizes_) std::get<kError>(all) = FPSanitizedError(std::get<kError>(all));
      std::apply(reply_, all);
    }
    void fail(const NSError &error) {
      Tuple all{};
      std::get<kError>(all) = sanitizes_ ? FPSanitizedError(error) : error;
      std::apply(reply_, all);
    }

   private:
    const std::function<void(Values...)> reply_;
    const bool sanitizes_;
    std::atomic_flag claimed_;
  };

  const Connection connection_;
  const NSXPCErrorHandler orError_;
  const std::string name_;
  const int requestPid_;
};

}  // namespace droxa
