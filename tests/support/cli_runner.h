#pragma once
// Runs the built cloudreel program as a user runs it: in a given folder,
// with its standard output and error captured in files kept outside that
// folder, so the folder holds only what the command itself leaves there.
// Test programs that use it define CLOUDREEL_BINARY, the program's path.

#include <fcntl.h>
#include <spawn.h>
#include <sys/wait.h>

#include <string>
#include <vector>

#include "support/temp_dir.h"

extern char** environ;

namespace cloudreel::testing {

struct Outcome {
  int status = -1;
  std::string out;
  std::string err;
};

inline Outcome runProgram(const std::filesystem::path& dir, std::vector<std::string> args) {
  static const TempDir streams;
  std::vector<char*> argv;
  for (std::string& arg : args) {
    argv.push_back(arg.data());
  }
  argv.push_back(nullptr);
  posix_spawn_file_actions_t actions;
  posix_spawn_file_actions_init(&actions);
  posix_spawn_file_actions_addchdir_np(&actions, dir.c_str());
  const std::string out = streams / "out", err = streams / "err";
  posix_spawn_file_actions_addopen(&actions, 1, out.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0600);
  posix_spawn_file_actions_addopen(&actions, 2, err.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0600);
  Outcome run;
  pid_t pid = 0;
  int waitStatus = 0;
  if (posix_spawn(&pid, argv[0], &actions, nullptr, argv.data(), environ) == 0 &&
      waitpid(pid, &waitStatus, 0) == pid && WIFEXITED(waitStatus)) {
    run.status = WEXITSTATUS(waitStatus);
  }
  posix_spawn_file_actions_destroy(&actions);
  run.out = readFile(out);
  run.err = readFile(err);
  return run;
}

#ifdef CLOUDREEL_BINARY
inline Outcome cloudreel(const TempDir& dir, std::vector<std::string> args) {
  args.insert(args.begin(), CLOUDREEL_BINARY);
  return runProgram(dir.path(), std::move(args));
}
#endif

}  // namespace cloudreel::testing
