#ifndef QVTESTER_TOOLS_OPTIONS_H_
#define QVTESTER_TOOLS_OPTIONS_H_

#include <CLI/CLI.hpp>
#include <opencv2/core.hpp>
#include <string>
#include <vector>

namespace qv {

/// Declares an option that takes a finite number from low to high.
CLI::Option* AddNumber(CLI::App& command, const char* name, double& value, const char* help, double low, double high,
                       const char* type);

/// "4000x3000"; throws Failure (wrong usage) that names the option.
cv::Size ParseSize(const char* option, const std::string& text);

/// "1,0.9,1": as many numbers from low to high as asked for; throws Failure (wrong usage) that names the option.
std::vector<double> ParseNumbers(const char* option, const std::string& text, std::size_t count, double low,
                                 double high);

}  // namespace qv

#endif  // QVTESTER_TOOLS_OPTIONS_H_
