#include "cli/ControlClient.h"

#include "cli/Waiting.h"

namespace droxa {

ControlClient::ControlClient(std::shared_ptr<ControlConnecting> connecting, std::chrono::milliseconds timeout)
    : connecting_(std::move(connecting)), timeout_(timeout) {}

namespace {

// Makes `call` of the host and waits for what it gives to its second argument.
template <class Value, class Call>
CallResult<Value> ask(ControlConnecting &connecting, std::chrono::milliseconds timeout, Call call) {
  auto slot = std::make_shared<AnswerSlot<Value>>();
  NSError error;
  auto control = connecting.control([slot](const NSError &failure) { slot->put({{}, failure}); }, &error);
  if (!control) return {{}, error};
  call(*control, slot);
  return slot->wait(timeout);
}

}  // namespace

CallResult<FPDStatus> ControlClient::status() {
  return ask<FPDStatus>(*connecting_, timeout_, [](FPDControlProtocol &control, auto slot) {
    control.getStatus([slot](const FPDStatus &status) { slot->put({status, NSError()}); });
  });
}

CallResult<ControlClient::Item> ControlClient::item(const std::string &identifier) {
  return ask<Item>(*connecting_, timeout_, [&](FPDControlProtocol &control, auto slot) {
    control.itemForIdentifier(identifier, [slot](const Item &item, const NSError &error) {
      slot->put({item, error});
    });
  });
}

CallResult<ControlClient::Item> ControlClient::itemAtPath(const std::string &path) {
  return ask<Item>(*connecting_, timeout_, [&](FPDControlProtocol &control, auto slot) {
    control.itemAtPath(path, [slot](const Item &item, const NSError &error) { slot->put({item, error}); });
  });
}

CallResult<NSURL> ControlClient::url(const std::string &identifier) {
  return ask<NSURL>(*connecting_, timeout_, [&](FPDControlProtocol &control, auto slot) {
    control.URLForItemIdentifier(identifier, [slot](const NSURL &url) { slot->put({url, NSError()}); });
  });
}

CallResult<ControlClient::Enumerator> ControlClient::enumerator(const std::string &identifier) {
  return ask<Enumerator>(*connecting_, timeout_, [&](FPDControlProtocol &control, auto slot) {
    control.enumeratorForContainer(identifier, [slot](const Enumerator &enumerator, const NSError &error) {
      slot->put({enumerator, error});
    });
  });
}

CallResult<std::shared_ptr<FPDWatch>> ControlClient::watch(const std::string &identifier,
                                                           std::shared_ptr<FPDWatchObserver> observer) {
  using Watch = std::shared_ptr<FPDWatch>;
  return ask<Watch>(*connecting_, timeout_, [&](FPDControlProtocol &control, auto slot) {
    control.watchContainer(identifier, observer, [slot](const Watch &watch, const NSError &error) {
      slot->put({watch, error});
    });
  });
}

CallResult<ControlClient::Provided> ControlClient::startProviding(const std::string &identifier,
                                                                  std::uint64_t readingOptions) {
  return ask<Provided>(*connecting_, timeout_, [&](FPDControlProtocol &control, auto slot) {
    control.startProvidingItemWithIdentifier(
        identifier, readingOptions,
        [slot](const std::shared_ptr<FPDProviding> &providing, const NSURL &url, const NSError &error) {
          slot->put({{providing, url}, error});
        });
  });
}

CallResult<std::shared_ptr<FPDAction>> ControlClient::performAction(const FPDActionRequest &request) {
  using Action = std::shared_ptr<FPDAction>;
  return ask<Action>(*connecting_, timeout_, [&](FPDControlProtocol &control, auto slot) {
    control.performAction(request, [slot](const Action &action, const NSError &error) {
      slot->put({action, error});
    });
  });
}

CallResult<std::shared_ptr<FPDThumbnails>> ControlClient::fetchThumbnails(
    const std::vector<std::string> &identifiers, CGSize size) {
  using Thumbnails = std::shared_ptr<FPDThumbnails>;
  return ask<Thumbnails>(*connecting_, timeout_, [&](FPDControlProtocol &control, auto slot) {
    control.fetchThumbnailsForItemIdentifiers(identifiers, size,
                                              [slot](const Thumbnails &thumbnails, const NSError &error) {
                                                slot->put({thumbnails, error});
                                              });
  });
}

NSError ControlClient::fillDesktopThumbnails(
    const std::string &container, const std::function<bool(std::chrono::milliseconds)> &waitForStop,
    bool *wasStopped) {
  constexpr std::chrono::milliseconds kLook{50};
  const auto slot = std::make_shared<AnswerSlot<bool>>();
  NSError error;
  const auto control = connecting_->control(
      [slot](const NSError &failure) {
        slot->put({false, failure});
      },
      &error);
  if (!control) return error;
  control->fillDesktopThumbnailsForContainer(container, [slot](const NSError &outcome) {
    slot->put({true, outcome});
  });
  for (;;) {
    if (const auto end = slot->waitFor(kLook)) return end->error;
    *wasStopped = waitForStop(std::chrono::milliseconds(0));
    if (*wasStopped) return {};
  }
}

CallResult<ControlClient::Item> ControlClient::defaultContainer(
    const std::optional<std::string> &application) {
  return ask<Item>(*connecting_, timeout_, [&](FPDControlProtocol &control, auto slot) {
    control.defaultContainerForBundleIdentifier(application, [slot](const Item &item, const NSError &error) {
      slot->put({item, error});
    });
  });
}

CallResult<std::string> ControlClient::mount(const std::string &path) {
  return ask<std::string>(*connecting_, timeout_, [&](FPDControlProtocol &control, auto slot) {
    control.mountAtPath(path, [slot](const std::string &mountPoint, const NSError &error) {
      slot->put({mountPoint, error});
    });
  });
}

NSError ControlClient::unmount() {
  return ask<bool>(*connecting_, timeout_,
                   [](FPDControlProtocol &control, auto slot) {
                     control.unmount([slot](const NSError &error) { slot->put({!error, error}); });
                   })
      .error;
}

CallResult<std::shared_ptr<FPDService>> ControlClient::service(const std::string &name,
                                                               const std::string &identifier) {
  using Service = std::shared_ptr<FPDService>;
  return ask<Service>(*connecting_, timeout_, [&](FPDControlProtocol &control, auto slot) {
    control.listenerEndpointForServiceName(name, identifier,
                                           [slot](const Service &service, const NSError &error) {
                                             slot->put({service, error});
                                           });
  });
}

CallResult<ControlClient::Page> ControlClient::page(const Enumerator &enumerator, const NSData &page) {
  auto slot = std::make_shared<AnswerSlot<Page>>();
  enumerator->enumerateItems(
      page, [slot](const NSFileProviderItems &items, const NSData &next, const NSError &error) {
        slot->put({{items, next}, error});
      });
  return slot->wait(timeout_);
}

CallResult<NSData> ControlClient::anchor(const Enumerator &enumerator) {
  auto slot = std::make_shared<AnswerSlot<NSData>>();
  enumerator->currentSyncAnchor([slot](const NSData &anchor) { slot->put({anchor, NSError()}); });
  return slot->wait(timeout_);
}

CallResult<ControlClient::Changes> ControlClient::changes(const Enumerator &enumerator,
                                                          const NSData &anchor) {
  auto slot = std::make_shared<AnswerSlot<Changes>>();
  enumerator->enumerateChanges(
      anchor, [slot](const NSFileProviderItems &updated, const std::vector<std::string> &, const NSData &next,
                     bool moreComing, const NSError &error) {
        slot->put({{updated, next, moreComing}, error});
      });
  return slot->wait(timeout_);
}

}  // namespace droxa
