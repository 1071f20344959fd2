#pragma once
/// \file
/// Running benchmarks and printing the ratio of one to a baseline measured in
/// the same run.

#include <string>
#include <utility>
#include <vector>

namespace midebug::bench {

/// Runs every registered benchmark (honouring the command-line options), then
/// prints, for each pair, the first's mean real time per iteration divided by
/// the second's. Returns the process exit code.
int RunAndPrintRatios(int argc, char** argv, const std::vector<std::pair<std::string, std::string>>& Ratios);

} // namespace midebug::bench
