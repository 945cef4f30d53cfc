#include "fileproviderd/Services.h"

#include <cerrno>
#include <utility>

namespace droxa {

// One client's hold on a service; counted from before the extension is asked.
class Services::Relayed final : public FPDService {
 public:
  Relayed(std::shared_ptr<Services> services, std::int32_t process)
      : services_(std::move(services)), process_(process) {}
  ~Relayed() override { services_->remove(process_); }
  Relayed(const Relayed &) = delete;
  Relayed &operator=(const Relayed &) = delete;

  // Once, before it is handed over.
  void setService(std::shared_ptr<FPDService> service) { service_ = std::move(service); }
  NSXPCListenerEndpoint endpoint() const override { return service_->endpoint(); }

 private:
  const std::shared_ptr<Services> services_;
  const std::int32_t process_;
  std::shared_ptr<FPDService> service_;  // the extension's
};

Services::Services(std::shared_ptr<ExtensionCalls> calls) : calls_(std::move(calls)) {}

void Services::open(const std::string &name, const std::string &itemIdentifier, std::int32_t process,
                    const FPDServiceCompletion &completion) {
  if (const NSError error = add(process)) return completion(nullptr, error);
  const auto relayed = std::make_shared<Relayed>(shared_from_this(), process);
  calls_->listenerEndpointForServiceName(
      name, itemIdentifier,
      [relayed, completion](const std::shared_ptr<FPDService> &service, const NSError &error) {
        if (!service) return completion(nullptr, error);
        relayed->setService(service);
        completion(relayed, NSError());
      });
}

std::size_t Services::held() const {
  const Lock lock(lock_);
  return all_;
}

NSError Services::add(std::int32_t process) {
  const Lock lock(lock_);
  std::size_t &own = held_[process];
  if (own >= kMostOfOneClient)
    return NSError::errorWithPOSIXCode(EMFILE, "process " + std::to_string(process) + " holds " +
                                                   std::to_string(own) +
                                                   " services; it has to let go of some first");
  if (all_ >= kMost) {
    if (own == 0) held_.erase(process);
    return NSError::errorWithPOSIXCode(
        EMFILE, "clients hold " + std::to_string(all_) + " services, and no more can be given out now");
  }
  ++own;
  ++all_;
  return NSError();
}

void Services::remove(std::int32_t process) {
  const Lock lock(lock_);
  --all_;
  const auto found = held_.find(process);
  if (--found->second == 0) held_.erase(found);
}

}  // namespace droxa
