#pragma once

#include <array>
#include <cstdint>
#include <fcntl.h>
#include <fstream>
#include <gtest/gtest.h>
#include <sstream>
#include <string>
#include <sys/wait.h>
#include <unistd.h>

#include "keld/thumbnails/SandboxedThumbnailer.h"
#include "tests/platform/TemporaryFolder.h"

namespace droxa::keld {

inline std::string BigEndian(std::uint32_t value) {
  std::string bytes;
  for (int shift = 24; shift >= 0; shift -= 8) bytes.push_back(static_cast<char>(value >> shift & 0xff));
  return bytes;
}

inline std::uint32_t Crc(const std::string &bytes) {
  std::uint32_t crc = 0xffffffff;
  for (const char byte : bytes) {
    crc ^= static_cast<unsigned char>(byte);
    for (int bit = 0; bit < 8; ++bit) crc = (crc >> 1) ^ ((crc & 1) != 0 ? 0xedb88320 : 0);
  }
  return ~crc;
}

inline std::string PngChunk(const std::string &type, const std::string &data) {
  return BigEndian(static_cast<std::uint32_t>(data.size())) + type + data + BigEndian(Crc(type + data));
}

// A grey PNG that says it has that size, with pixels that are worth only a few of its rows.
inline std::string PngThatClaims(std::uint32_t width, std::uint32_t height) {
  const std::string header = BigEndian(width) + BigEndian(height) + std::string("\x08\x00\x00\x00\x00", 5);
  const std::string row(64, '\0');
  std::string pixels("\x78\x01\x01\x40\x00\xbf\xff", 7);
  pixels += row + BigEndian(64U << 16 | 1U);
  return "\x89PNG\r\n\x1a\n" + PngChunk("IHDR", header) + PngChunk("IDAT", pixels) + PngChunk("IEND", "");
}

// A PDF of one page of that size in points, which draws what `contents` says.
inline std::string PdfOf(const std::string &size, const std::string &contents) {
  std::string pdf = "%PDF-1.4\n";
  std::array<std::size_t, 5> offsets{};
  const auto add = [&](std::size_t number, const std::string &object) {
    offsets[number] = pdf.size();
    pdf += std::to_string(number) + " 0 obj\n" + object + "\nendobj\n";
  };
  add(1, "<< /Type /Catalog /Pages 2 0 R >>");
  add(2, "<< /Type /Pages /Kids [3 0 R] /Count 1 >>");
  add(3, "<< /Type /Page /Parent 2 0 R /MediaBox [0 0 " + size + "] /Contents 4 0 R >>");
  add(4, "<< /Length " + std::to_string(contents.size()) + " >>\nstream\n" + contents + "\nendstream");
  const std::size_t table = pdf.size();
  pdf += "xref\n0 5\n0000000000 65535 f \n";
  for (std::size_t number = 1; number < offsets.size(); ++number) {
    std::string offset = std::to_string(offsets[number]);
    pdf += std::string(10 - offset.size(), '0') + offset + " 00000 n \n";
  }
  return pdf + "trailer << /Size 5 /Root 1 0 R >>\nstartxref\n" + std::to_string(table) + "\n%%EOF\n";
}

// Files that tests have thumbnails made of. Thread contract: the test's thread.
class ThumbnailFiles : public testing::Test {
 protected:
  using Outcome = ThumbnailResult::Outcome;

  std::string at(const std::string &name) const { return folder.path() + "/" + name; }
  std::string draw(const std::string &form, int width, int height, const std::string &name) const {
    EXPECT_EQ(run({PICTURE_MAKER, form, std::to_string(width), std::to_string(height), at(name)}, nullptr),
              0);
    return read(name);
  }
  std::string read(const std::string &name) const {
    std::ifstream file(at(name), std::ios::binary);
    return {std::istreambuf_iterator<char>(file), {}};
  }
  std::string pixel(const std::string &name, unsigned x, unsigned y) const {
    std::string printed;
    EXPECT_EQ(run({PICTURE_MAKER, "pixel", at(name), std::to_string(x), std::to_string(y)}, &printed), 0);
    return printed;
  }
  ThumbnailResult make(Thumbnailer &thumbnailer, const std::string &contents, const std::string &type) const {
    folder.write("contents", contents);
    const OwnedDescriptor file(::open(at("contents").c_str(), O_RDONLY | O_CLOEXEC));
    return thumbnailer.make(file.get(), type, never);
  }
  // The bytes of what was made, which are also put into the file `name`.
  std::string bytesOf(const ThumbnailResult &result, const std::string &name = "made.png") const {
    std::string bytes(result.size, '\0');
    EXPECT_EQ(::pread(result.png.get(), bytes.data(), bytes.size(), 0), static_cast<ssize_t>(bytes.size()));
    folder.write(name, bytes);
    return bytes;
  }
  static int run(const std::vector<std::string> &words, std::string *printed) {
    std::string command;
    for (const std::string &word : words) command += "'" + word + "' ";
    FILE *output = ::popen(command.c_str(), "re");
    std::array<char, 256> buffer{};
    while (output && std::fgets(buffer.data(), buffer.size(), output))
      if (printed) *printed += buffer.data();
    return output ? ::pclose(output) : -1;
  }

  const TemporaryFolder folder;
  const CKCancellation never{};
};

}  // namespace droxa::keld
