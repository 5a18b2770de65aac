// Where the daemon's socket may be.
#pragma once

#include <cstdlib>
#include <string>
#include <vector>

namespace tal::clientlib {

/// The paths to try, in order: the one that the program gave, else the one that the environment gives, else
/// the user's runtime directory and then the system's. A program that runs with more rights than its user
/// does not listen to the environment.
inline std::vector<std::string> socketPaths(const char* given) {
  if (given) return {given};
  if (const char* named = secure_getenv("TALREPORTING_SOCKET"); named && *named) return {named};
  std::vector<std::string> paths;
  if (const char* runtime = secure_getenv("XDG_RUNTIME_DIR"); runtime && *runtime) {
    paths.push_back(std::string(runtime) + "/talreporting/talreporting.sock");
  }
  paths.emplace_back("/run/talreporting/talreporting.sock");
  return paths;
}

}  // namespace tal::clientlib
