#include "platform/cloudkit/embedded/RecordCoding.h"

#include <bit>
#include <cstring>

namespace droxa::embedded {
namespace {

// The kinds as they are stored.
enum class Kind : std::uint8_t { integer = 1, real, string, data, date, strings, asset };

class Writer {
 public:
  void kind(Kind kind) { bytes_ += static_cast<char>(kind); }
  void number(std::uint64_t value) {
    for (int shift = 0; shift < 64; shift += 8) bytes_ += static_cast<char>((value >> shift) & 0xff);
  }
  void string(std::string_view text) {
    number(text.size());
    bytes_ += text;
  }
  std::string take() { return std::move(bytes_); }

 private:
  std::string bytes_;
};

// Reads what a Writer wrote; ok() turns false, for good, at the first thing that can't be.
class Reader {
 public:
  explicit Reader(std::string_view bytes) : rest_(bytes) {}
  bool ok() const { return ok_; }
  bool atEnd() const { return rest_.empty(); }
  std::uint8_t byte() {
    const std::string_view one = take(1);
    return one.empty() ? std::uint8_t{0} : static_cast<std::uint8_t>(one.front());
  }
  std::uint64_t number() {
    std::uint64_t value = 0;
    int shift = 0;
    for (const char c : take(8)) {
      value |= std::uint64_t{static_cast<unsigned char>(c)} << shift;
      shift += 8;
    }
    return value;
  }
  std::string_view string() { return take(number()); }

 private:
  std::string_view take(std::uint64_t count) {
    if (!ok_ || count > rest_.size()) {
      ok_ = false;
      return {};
    }
    const std::string_view taken = rest_.substr(0, count);
    rest_.remove_prefix(count);
    return taken;
  }
  std::string_view rest_;
  bool ok_ = true;
};

struct ValueWriter {
  Writer &writer;
  const std::string &key;

  void start(Kind kind) const {
    writer.kind(kind);
    writer.string(key);
  }
  void operator()(std::monostate) const {}
  void operator()(std::int64_t value) const {
    start(Kind::integer);
    writer.number(static_cast<std::uint64_t>(value));
  }
  void operator()(double value) const {
    start(Kind::real);
    writer.number(std::bit_cast<std::uint64_t>(value));
  }
  void operator()(const std::string &value) const {
    start(Kind::string);
    writer.string(value);
  }
  void operator()(const NSData &value) const {
    start(Kind::data);
    const auto bytes = value.bytes();
    writer.string({reinterpret_cast<const char *>(bytes.data()), bytes.size()});
  }
  void operator()(const NSDate &value) const {
    start(Kind::date);
    writer.number(static_cast<std::uint64_t>(value.nanosecondsSince1970()));
  }
  void operator()(const std::vector<std::string> &values) const {
    start(Kind::strings);
    writer.number(values.size());
    for (const std::string &value : values) writer.string(value);
  }
  void operator()(const CKAsset &asset) const {
    start(Kind::asset);
    writer.number(asset.reference().size);
    writer.string(asset.reference().sha256);
  }
};

CKRecordValue readStrings(Reader &reader) {
  std::vector<std::string> values;
  const std::uint64_t count = reader.number();
  for (std::uint64_t i = 0; i < count && reader.ok(); ++i) values.emplace_back(reader.string());
  return values;
}

CKRecordValue readAsset(Reader &reader) {
  CKAssetReference reference;
  reference.size = reader.number();
  reference.sha256 = reader.string();
  return CKAsset::assetWithReference(std::move(reference));
}

// No value: an unknown kind.
CKRecordValue readValue(Reader &reader, Kind kind) {
  switch (kind) {
    case Kind::integer:
      return static_cast<std::int64_t>(reader.number());
    case Kind::real:
      return std::bit_cast<double>(reader.number());
    case Kind::string:
      return std::string(reader.string());
    case Kind::data:
      return NSData::dataWithString(reader.string());
    case Kind::date:
      return NSDate::dateWithNanosecondsSince1970(static_cast<std::int64_t>(reader.number()));
    case Kind::strings:
      return readStrings(reader);
    case Kind::asset:
      return readAsset(reader);
  }
  return {};
}

}  // namespace

std::string EncodeFields(const Fields &fields) {
  Writer writer;
  for (const auto &[key, value] : fields) {
    if (!CKRecordValueIsNone(value)) std::visit(ValueWriter{writer, key}, value);
  }
  return writer.take();
}

std::optional<Fields> DecodeFields(std::string_view bytes, const CKDesiredKeys &desiredKeys) {
  Fields fields;
  Reader reader(bytes);
  while (!reader.atEnd()) {
    const auto kind = static_cast<Kind>(reader.byte());
    std::string key(reader.string());
    CKRecordValue value = readValue(reader, kind);
    if (!reader.ok() || std::holds_alternative<std::monostate>(value)) return std::nullopt;
    if (!desiredKeys || desiredKeys->contains(key)) fields.insert_or_assign(std::move(key), std::move(value));
  }
  return fields;
}

}  // namespace droxa::embedded
