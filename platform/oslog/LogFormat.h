#pragma once

#include <concepts>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <type_traits>
#include <vector>

namespace droxa {

// What a conversion of a log format accepts.
enum class LogArgumentKind : std::uint8_t { object, text, integer, floating };

template <class T>
concept Describable = requires(const T &value) {
  { value.description() } -> std::convertible_to<std::string>;
};

// The text of a value for "%@"; nil (a null pointer, an empty optional, a nil handle) gives "(null)".
inline std::string LogDescription(const std::string &value) {
  return value;
}
inline std::string LogDescription(const char *value) {
  return value ? value : "(null)";
}
template <Describable T>
std::string LogDescription(const T &value) {
  if constexpr (requires { static_cast<bool>(value); }) {
    if (!static_cast<bool>(value)) return "(null)";
  }
  return value.description();
}
template <class T>
std::string LogDescription(const std::shared_ptr<T> &value);
template <class T>
std::string LogDescription(const std::optional<T> &value);
template <class T>
std::string LogDescription(const std::vector<T> &value);

template <class T>
std::string LogDescription(const std::shared_ptr<T> &value) {
  return value ? LogDescription(*value) : "(null)";
}
template <class T>
std::string LogDescription(const std::optional<T> &value) {
  return value ? LogDescription(*value) : "(null)";
}
// "(a, b)": arrays in one line.
template <class T>
std::string LogDescription(const std::vector<T> &value) {
  std::string text = "(";
  for (const T &element : value) {
    if (text.size() > 1) text += ", ";
    text += LogDescription(element);
  }
  return text + ")";
}

// An argument on its way to the printer.
struct LogArgument {
  LogArgumentKind kind;
  std::string object;              // kind object or text
  unsigned long long integer = 0;  // kind integer, two's complement
  double floating = 0;             // kind floating
};

template <class T>
LogArgument MakeLogArgument(const T &value) {
  if constexpr (std::is_integral_v<T>) {
    return {LogArgumentKind::integer, {}, static_cast<unsigned long long>(static_cast<long long>(value)), 0};
  } else if constexpr (std::is_floating_point_v<T>) {
    return {LogArgumentKind::floating, {}, 0, static_cast<double>(value)};
  } else {
    return {LogArgumentKind::object, LogDescription(value), 0, 0};
  }
}

namespace log_format_detail {

// Reached only while a format is checked at compile time: makes the build fail with this name.
void formatAndArgumentsDoNotAgree();

template <class T>
constexpr bool accepts(char conversion, int longs) {
  using U = std::remove_cvref_t<std::decay_t<T>>;
  constexpr bool isText = std::is_convertible_v<U, std::string_view>;
  switch (conversion) {
    case '@':
      return !std::is_integral_v<U> && !std::is_floating_point_v<U>;
    case 's':
      return isText;
    case 'd':
    case 'u':
    case 'x':
      return std::is_integral_v<U> && sizeof(U) <= (longs > 0 ? sizeof(long long) : sizeof(int));
    case 'f':
      return std::is_floating_point_v<U>;
    default:
      return false;
  }
}

// The next conversion at or after `position`: skips flags and precision, counts 'l'. Returns 0 at the end.
constexpr char nextConversion(std::string_view format, std::size_t &position, int &longs) {
  while (position < format.size()) {
    if (format[position++] != '%') continue;
    if (position < format.size() && format[position] == '%') {
      ++position;
      continue;
    }
    longs = 0;
    while (position < format.size() &&
           (format[position] == '.' || (format[position] >= '0' && format[position] <= '9')))
      ++position;
    while (position < format.size() && format[position] == 'l') {
      ++longs;
      ++position;
    }
    return position < format.size() ? format[position++] : '?';
  }
  return 0;
}

template <class... Args>
constexpr bool agrees(std::string_view format) {
  std::size_t position = 0;
  int longs = 0;
  const bool each = ([&] {
    const char conversion = nextConversion(format, position, longs);
    return conversion != 0 && accepts<Args>(conversion, longs);
  }() && ...);
  return each && nextConversion(format, position, longs) == 0;
}

std::string print(std::string_view format, const LogArgument *arguments, std::size_t count);

}  // namespace log_format_detail

// A format text that was checked against its argument types when the code was compiled.
template <class... Args>
class LogFormat {
 public:
  template <std::size_t N>
  consteval LogFormat(const char (&text)[N]) : text_(text, N - 1) {
    if (!log_format_detail::agrees<Args...>(text_)) log_format_detail::formatAndArgumentsDoNotAgree();
  }

  std::string print(const Args &...args) const {
    if constexpr (sizeof...(Args) == 0) {
      return log_format_detail::print(text_, nullptr, 0);
    } else {
      const LogArgument list[] = {MakeLogArgument(args)...};
      return log_format_detail::print(text_, list, sizeof...(Args));
    }
  }

 private:
  std::string_view text_;
};

// NSString's stringWithFormat: with the same checked formats.
template <class... Args>
std::string NSStringWithFormat(LogFormat<std::type_identity_t<Args>...> format, const Args &...args) {
  return format.print(args...);
}

}  // namespace droxa
