#ifndef QVTESTER_TOOLS_OPTIONS_H_
#define QVTESTER_TOOLS_OPTIONS_H_

#include <cstdint>
#include <functional>
#include <opencv2/core.hpp>
#include <optional>
#include <string>
#include <vector>

namespace CLI {
class App;
}

// The command line: what commands declare, and how words become values. The parser itself is known to options.cpp
// alone.

namespace qv {

/// A command's body; answers the exit status.
using CommandBody = std::function<int()>;

/// The options of one command. A name is "--name" or "-n,--name"; without dashes it is an argument. What the value
/// holds when it is declared is its default, and help shows it. The values must outlive the parsing.
class Options {
 public:
  explicit Options(CLI::App& command) : command_(&command) {}

  void Argument(const char* name, std::string& value, const std::string& help);
  void Arguments(const char* name, std::vector<std::string>& values, const std::string& help, const char* type,
                 bool required);
  void Flag(const char* name, bool& value, const std::string& help);
  void Text(const char* name, std::string& value, const std::string& help, const char* type, bool required = false);
  /// Empty when it is not given.
  void Text(const char* name, std::optional<std::string>& value, const std::string& help, const char* type);
  /// May be given again and again.
  void Texts(const char* name, std::vector<std::string>& values, const std::string& help, const char* type);
  /// One or more words behind it.
  void List(const char* name, std::vector<std::string>& values, const std::string& help, const char* type);
  void Choice(const char* name, std::string& value, const std::vector<std::string>& choices, const std::string& help,
              const char* type);
  void Choice(const char* name, int& value, const std::vector<int>& choices, const std::string& help, const char* type);
  /// An argument of these words only.
  void ChoiceArgument(const char* name, std::string& value, const std::vector<std::string>& choices,
                      const std::string& help);
  /// A finite number from low to high.
  void Number(const char* name, double& value, double low, double high, const std::string& help, const char* type);
  /// Its default stands elsewhere; help tells it in these words.
  void Number(const char* name, std::optional<double>& value, double low, double high, const std::string& initial,
              const std::string& help, const char* type);
  void Whole(const char* name, int& value, int low, int high, const std::string& help, const char* type);
  void Seed(const char* name, std::uint64_t& value, const std::string& help);

 private:
  CLI::App* command_;
};

/// "a, b or c".
std::string Listed(const std::vector<std::string>& words);
/// "0 to 255".
std::string RangeText(double low, double high);
/// "Grey level [125; 0 to 255]": help, what counts where nothing is given, and what may be given; either may be empty.
std::string InBrackets(const std::string& help, const std::string& initial, const std::string& range = "");

struct Command {
  const char* name;  // "video record" stands below "video"
  const char* purpose;
  /// Declares the options and hands back what runs once they are parsed; none for one that others stand below.
  std::function<CommandBody(Options&)> declare;
};

struct ProgramText {
  const char* name;
  const char* purpose;
  const char* version;
  const char* footer;
};

/// What the words after the program's name ask for. Help and version are printed here; the body then only answers the
/// status. Throws Failure (wrong usage) for words that don't fit.
CommandBody Parse(const ProgramText& text, const std::vector<Command>& commands, const std::vector<std::string>& words);

/// "4000x3000"; throws Failure (wrong usage) that names the option.
cv::Size ParseSize(const char* option, const std::string& text);

/// "1,0.9,1": as many numbers from low to high as asked for; throws Failure (wrong usage) that names the option.
std::vector<double> ParseNumbers(const char* option, const std::string& text, std::size_t count, double low,
                                 double high);

}  // namespace qv

#endif  // QVTESTER_TOOLS_OPTIONS_H_
