// Runs a program and collects what it prints.
#pragma once

#include <string>
#include <vector>

struct ProgramResult {
  int code = -1;  // -1 when it could not be started or was ended by a signal
  std::string out;
  std::string err;
};

// Waits for the end. `outFile` takes the standard output in place of the result, where given.
ProgramResult RunProgram(const std::string& program, const std::vector<std::string>& args,
                         const std::string& outFile = {});
