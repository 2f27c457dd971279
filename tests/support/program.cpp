#include "tests/support/program.h"

#include <fcntl.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdio>
#include <memory>

namespace {

// A file without a name, for output of any length: a pipe would have to be read while the other fills.
using File = std::unique_ptr<std::FILE, int (*)(std::FILE*)>;

std::string Contents(std::FILE* file) {
  std::string text;
  std::rewind(file);
  char block[1 << 14];
  while (const std::size_t bytes = std::fread(block, 1, sizeof block, file)) text.append(block, bytes);
  return text;
}

}  // namespace

ProgramResult RunProgram(const std::string& program, const std::vector<std::string>& args, const std::string& outFile) {
  const File out(outFile.empty() ? std::tmpfile() : std::fopen(outFile.c_str(), "w"), std::fclose);
  const File err(std::tmpfile(), std::fclose);
  ProgramResult result;
  if (!out || !err) return result;
  std::vector<char*> argv{const_cast<char*>(program.c_str())};
  for (const std::string& arg : args) argv.push_back(const_cast<char*>(arg.c_str()));
  argv.push_back(nullptr);
  posix_spawn_file_actions_t actions;
  posix_spawn_file_actions_init(&actions);
  posix_spawn_file_actions_adddup2(&actions, fileno(out.get()), STDOUT_FILENO);
  posix_spawn_file_actions_adddup2(&actions, fileno(err.get()), STDERR_FILENO);
  pid_t child = 0;
  const int started = posix_spawn(&child, program.c_str(), &actions, nullptr, argv.data(), environ);
  posix_spawn_file_actions_destroy(&actions);
  int status = 0;
  if (started != 0 || waitpid(child, &status, 0) != child) return result;
  if (WIFEXITED(status)) result.code = WEXITSTATUS(status);
  if (outFile.empty()) result.out = Contents(out.get());
  result.err = Contents(err.get());
  return result;
}
