#pragma once
// JSON as the commands print it. File names and PLY header names are bytes,
// not text: a name that is not valid UTF-8 is written with U+FFFD in place
// of each bad byte rather than stopping the program, so any file can be
// described.

#include <nlohmann/json.hpp>
#include <string>

namespace cloudreel::cli {

inline std::string jsonText(const nlohmann::ordered_json& json) {
  return json.dump(-1, ' ', false, nlohmann::ordered_json::error_handler_t::replace) + "\n";
}

}  // namespace cloudreel::cli
