#pragma once

#include <cstdint>
#include <optional>
#include <string_view>

namespace droxa::keld {

struct PngSize {
  std::uint32_t width = 0, height = 0;
};

// The size of an image whose bytes are those of one whole PNG, with nothing before, after or in it but what
// an image needs: no text, no times, no profile. nullopt for anything else. The pixels aren't looked at. Any
// thread.
std::optional<PngSize> CheckPng(std::string_view bytes);

}  // namespace droxa::keld
