#include "platform/usermanagement/PersonaRegistry.h"

#include <algorithm>
#include <cerrno>
#include <thread>

namespace droxa {

class UMPersonaContext {
 public:
  UMPersonaContext(std::uint64_t savedGeneration, PersonaChoice savedChoice)
      : thread(std::this_thread::get_id()), generation(savedGeneration), choice(std::move(savedChoice)) {}

  const std::thread::id thread;
  const std::uint64_t generation;
  const PersonaChoice choice;
};

namespace {

struct ThreadChoice {
  std::uint64_t generation = 0;  // 0: none was made
  PersonaChoice choice;
};

thread_local ThreadChoice threadChoice;

class CurrentPersona final : public UMPersona {
 public:
  CurrentPersona(std::optional<std::string> uniqueString, bool isDataSeparated)
      : uniqueString_(std::move(uniqueString)), isDataSeparated_(isDataSeparated) {}

  std::optional<std::string> userPersonaUniqueString() const override { return uniqueString_; }
  bool isDataSeparatedPersona() const override { return isDataSeparated_; }
  std::shared_ptr<UMPersonaContext> copyCurrentPersonaContextWithError(NSError *error) const override {
    return PersonaRegistry::shared().save(error);
  }
  NSError generateAndRestorePersonaContextWithPersonaUniqueString(
      const std::optional<std::string> &uniqueString) const override {
    return PersonaRegistry::shared().switchTo(uniqueString);
  }

 private:
  const std::optional<std::string> uniqueString_;
  const bool isDataSeparated_;
};

}  // namespace

PersonaRegistry &PersonaRegistry::shared() {
  static auto *registry = new PersonaRegistry;
  return *registry;
}

void PersonaRegistry::configure(UMConfiguration configuration) {
  const Lock lock(mutex_);
  configuration_ = std::move(configuration);
  ++generation_;
}

UMConfiguration PersonaRegistry::configuration() const {
  const Lock lock(mutex_);
  return configuration_;
}

bool PersonaRegistry::mayUseArbitraryPersonas() const {
  const Lock lock(mutex_);
  return configuration_.mayUseArbitraryPersonas;
}

const PersonaChoice &PersonaRegistry::choice() const {
  return threadChoice.generation == generation_ ? threadChoice.choice : configuration_.processPersona;
}

void PersonaRegistry::setChoice(PersonaChoice choice) const {
  threadChoice = {generation_, std::move(choice)};
}

const UMPersonaDescription *PersonaRegistry::find(const std::string &uniqueString) const {
  const auto &personas = configuration_.personas;
  const auto found = std::find_if(personas.begin(), personas.end(), [&](const UMPersonaDescription &persona) {
    return persona.uniqueString == uniqueString;
  });
  return found == personas.end() ? nullptr : &*found;
}

std::shared_ptr<UMPersona> PersonaRegistry::current() const {
  const Lock lock(mutex_);
  const PersonaChoice &chosen = choice();
  if (!chosen) return std::make_shared<CurrentPersona>(configuration_.personalUniqueString, false);
  const UMPersonaDescription *persona = find(*chosen);
  return std::make_shared<CurrentPersona>(chosen, persona ? persona->isDataSeparated : true);
}

NSError PersonaRegistry::switchTo(const PersonaChoice &wanted) {
  const Lock lock(mutex_);
  if (configuration_.failSwitching) return configuration_.failSwitching;
  if (!configuration_.mayUseArbitraryPersonas && wanted != choice()) {
    return NSError::errorWithPOSIXCode(EPERM, "This process may not switch personas");
  }
  if (!wanted || wanted == configuration_.personalUniqueString) {
    setChoice(std::nullopt);
    return {};
  }
  if (!find(*wanted) && wanted != configuration_.processPersona) {
    return NSError::errorWithPOSIXCode(ENOENT, "There is no persona \"" + *wanted + "\"");
  }
  setChoice(wanted);
  return {};
}

std::shared_ptr<UMPersonaContext> PersonaRegistry::save(NSError *error) const {
  const Lock lock(mutex_);
  if (configuration_.failSaving) {
    if (error) *error = configuration_.failSaving;
    return nullptr;
  }
  return std::make_shared<UMPersonaContext>(generation_, choice());
}

NSError PersonaRegistry::restore(const UMPersonaContext &context) {
  if (context.thread != std::this_thread::get_id()) {
    return NSError::errorWithPOSIXCode(EINVAL, "A persona is restored by the thread that saved it");
  }
  const Lock lock(mutex_);
  if (context.generation != generation_) {
    return NSError::errorWithPOSIXCode(ESTALE, "The personas were configured anew since this one was saved");
  }
  setChoice(context.choice);
  return {};
}

}  // namespace droxa
