#include "platform/foundation/NSObject.h"

#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cxxabi.h>
#include <memory>
#include <typeinfo>

namespace droxa {
namespace {

std::string className(const std::type_info &type) {
  int status = 0;
  const std::unique_ptr<char, decltype(&std::free)> name(
      abi::__cxa_demangle(type.name(), nullptr, nullptr, &status), &std::free);
  std::string text = name ? name.get() : type.name();
  const std::string prefix = "droxa::";
  return text.starts_with(prefix) ? text.substr(prefix.size()) : text;
}

}  // namespace

std::string NSObject::description() const {
  char address[2 + 2 * sizeof(void *) + 1];
  std::snprintf(address, sizeof address, "0x%llx",
                static_cast<unsigned long long>(reinterpret_cast<std::uintptr_t>(this)));
  return "<" + className(typeid(*this)) + ": " + address + ">";
}

}  // namespace droxa
