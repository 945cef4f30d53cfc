#include "platform/oslog/LogFormat.h"

#include <cstdio>
#include <cstdlib>

namespace droxa::log_format_detail {

void formatAndArgumentsDoNotAgree() {
  std::abort();
}

namespace {

struct Conversion {
  std::string flags;  // "0", width and precision, as written
  int longs = 0;
  char letter = 0;
};

// Reads a conversion whose '%' is before `position`, and leaves `position` behind it.
Conversion readConversion(std::string_view format, std::size_t &position) {
  Conversion conversion;
  while (position < format.size() &&
         (format[position] == '.' || (format[position] >= '0' && format[position] <= '9'))) {
    conversion.flags += format[position++];
  }
  for (; position < format.size() && format[position] == 'l'; ++position) ++conversion.longs;
  if (position < format.size()) conversion.letter = format[position++];
  return conversion;
}

template <class Value>
std::string formatted(const std::string &format, Value value) {
  const int length = std::snprintf(nullptr, 0, format.c_str(), value);
  if (length <= 0) return {};
  std::string text(static_cast<std::size_t>(length) + 1, '\0');
  std::snprintf(text.data(), text.size(), format.c_str(), value);
  text.pop_back();
  return text;
}

std::string printed(const Conversion &conversion, const LogArgument &argument) {
  const std::string start = "%" + conversion.flags;
  switch (conversion.letter) {
    case 'd':
      return formatted(start + "lld", static_cast<long long>(argument.integer));
    case 'u':
    case 'x': {
      // A negative int prints with its own width.
      const unsigned long long value =
          conversion.longs > 0 ? argument.integer : argument.integer & 0xffff'ffffU;
      return formatted(start + "ll" + conversion.letter, value);
    }
    case 'f':
      return formatted(start + "f", argument.floating);
    default:
      return argument.object;
  }
}

}  // namespace

std::string print(std::string_view format, const LogArgument *arguments, std::size_t count) {
  std::string text;
  std::size_t used = 0;
  for (std::size_t position = 0; position < format.size();) {
    const char c = format[position++];
    if (c != '%') {
      text += c;
    } else if (position < format.size() && format[position] == '%') {
      text += '%';
      ++position;
    } else {
      const Conversion conversion = readConversion(format, position);
      if (used < count) text += printed(conversion, arguments[used++]);
    }
  }
  return text;
}

}  // namespace droxa::log_format_detail
