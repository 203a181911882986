#pragma once
// Failures a user must see travel as values: a domain, an integer code and a
// message. Nothing in the core throws across a module boundary.

#include <string>

namespace cloudreel {

struct Error {
  std::string domain;
  int code = 0;
  std::string message;

  friend bool operator==(const Error&, const Error&) = default;
};

// Fills an optional error out-parameter; callers that do not care pass null.
inline void setError(Error* out, std::string domain, int code, std::string message) {
  if (out != nullptr) {
    *out = Error{std::move(domain), code, std::move(message)};
  }
}

}  // namespace cloudreel
