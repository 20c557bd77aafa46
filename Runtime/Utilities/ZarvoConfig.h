// The engine version that this runtime carries.
#pragma once

namespace ZarvoConfig {

inline constexpr const char* ZarvoVersion = "7041.3.0b12";
inline constexpr const char* ZarvoVersionUnderHash = "7041.3.0b12_9a41c07e2d6b"; // with its revision

} // namespace ZarvoConfig
