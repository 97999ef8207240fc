#include "tools/options.h"

#include <algorithm>
#include <cmath>
#include <sstream>

#include "desk/base/failure.h"
#include "desk/base/text.h"

namespace qv {

CLI::Option* AddNumber(CLI::App& command, const char* name, double& value, const char* help, double low, double high,
                       const char* type) {
  const auto within = [low, high](const std::string& text) {
    double number = NAN;
    const bool read = CLI::detail::lexical_cast(text, number);
    return read && number >= low && number <= high ? std::string()
                                                   : Format("%s is no number from %g to %g", text.c_str(), low, high);
  };
  return command.add_option(name, value, help)->check(within, "", "finite")->type_name(type);
}

cv::Size ParseSize(const char* option, const std::string& text) {
  int width = 0;
  int height = 0;
  char by = 0;
  std::istringstream words(text);
  words >> width >> by >> height;
  if (!words || !words.eof() || by != 'x' || std::min(width, height) < 16 || std::max(width, height) > 30000) {
    throw Failure(kWrongUsage,
                  Format("%s %s: give WIDTHxHEIGHT in pixels, 16 to 30000 each, as 4000x3000", option, text.c_str()));
  }
  return {width, height};
}

std::vector<double> ParseNumbers(const char* option, const std::string& text, std::size_t count, double low,
                                 double high) {
  std::vector<double> numbers;
  std::istringstream words(text);
  char comma = ',';
  for (double number = 0; comma == ',' && words >> number;) {
    if (number >= low && number <= high) numbers.push_back(number);
    comma = 0;
    words >> comma;
  }
  if (numbers.size() != count || !words.eof() || comma != 0) {
    throw Failure(kWrongUsage, Format("%s %s: give %zu numbers from %g to %g with commas between", option, text.c_str(),
                                      count, low, high));
  }
  return numbers;
}

}  // namespace qv
