#include "tools/options.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <array>
#include <climits>
#include <cmath>
#include <sstream>

#include "desk/base/failure.h"
#include "desk/base/text.h"
#include "tools/program.h"

namespace qv {

namespace {

std::string WithDefault(const std::string& help, const std::string& value) {
  return value.empty() ? help : help + " [" + value + "]";
}

std::function<std::string(const std::string&)> Within(double low, double high) {
  return [low, high](const std::string& text) {
    double number = NAN;
    const bool read = CLI::detail::lexical_cast(text, number);
    return read && number >= low && number <= high ? std::string()
                                                   : Format("%s is no number from %g to %g", text.c_str(), low, high);
  };
}

bool NamesFile(const std::string& type) {
  constexpr std::array<const char*, 9> kTypes = {"FILE", "PNG", "OUT", "STORE", "DIR", "HTML", "XML", "SVG", "PHOTO"};
  return std::any_of(kTypes.begin(), kTypes.end(), [&](const char* one) { return type == one; });
}

// A script's variable that is not set ends here, and not in an output that nobody gets.
void RefuseEmptyName(CLI::Option& option, const std::string& type = "FILE") {
  if (!NamesFile(type)) return;
  option.check([](const std::string& name) { return std::string(name.empty() ? "an empty name" : ""); }, "");
}

std::vector<std::string> NamesKnown(const CLI::App& command, bool options) {
  std::vector<std::string> known;
  for (const CLI::App* one : command.get_subcommands([](const CLI::App*) { return true; })) {
    if (!options) known.push_back(one->get_name());
  }
  for (const CLI::Option* option : command.get_options()) {
    if (options && !option->get_lnames().empty()) known.push_back("--" + option->get_lnames()[0]);
  }
  return known;
}

// What is wrong with the words, in a sentence; of words that nobody knows the first.
std::string Complaint(const CLI::App& app, const CLI::ParseError& e) {
  const CLI::App* command = &app;
  std::string name = app.get_name();
  while (!command->get_subcommands().empty()) {
    command = command->get_subcommands().back();
    name += " " + command->get_name();
  }
  const std::string help = "; `" + name + " --help` shows what there is";
  const bool group = command->get_require_subcommand_min() > 0;
  const std::vector<std::string> unknown = command->remaining();
  const bool of_words = e.get_exit_code() == static_cast<int>(CLI::ExitCodes::ExtrasError) ||
                        e.get_exit_code() == static_cast<int>(CLI::ExitCodes::RequiredError);
  if (!of_words || (unknown.empty() && !group)) return e.what() + help;
  if (unknown.empty()) return "a command is needed" + help;
  const auto dashed =
      std::find_if(unknown.begin(), unknown.end(), [](const std::string& word) { return word.rfind('-', 0) == 0; });
  const bool option = dashed != unknown.end();
  const std::string& word = option ? *dashed : unknown.front();
  const std::string nearest = option || group ? DidYouMean(word, NamesKnown(*command, option)) : "";
  const char* const what = option ? ": no such option" : group ? ": no such command" : ": one word too many";
  return (word.empty() ? "\"\"" : word) + what + (nearest.empty() ? help : nearest);
}

}  // namespace

void Options::Argument(const char* name, std::string& value, const std::string& help) {
  RefuseEmptyName(*command_->add_option(name, value, help)->required());
}

void Options::Arguments(const char* name, std::vector<std::string>& values, const std::string& help, const char* type,
                        bool required) {
  RefuseEmptyName(*command_->add_option(name, values, help)->required(required)->type_name(type), type);
}

void Options::Flag(const char* name, bool& value, const std::string& help) { command_->add_flag(name, value, help); }

void Options::Text(const char* name, std::string& value, const std::string& help, const char* type, bool required) {
  RefuseEmptyName(*command_->add_option(name, value, WithDefault(help, value))->required(required)->type_name(type),
                  type);
}

void Options::Text(const char* name, std::optional<std::string>& value, const std::string& help, const char* type) {
  command_->add_option(name, value, help)->type_name(type);
}

void Options::Texts(const char* name, std::vector<std::string>& values, const std::string& help, const char* type) {
  command_->add_option(name, values, help)
      ->multi_option_policy(CLI::MultiOptionPolicy::TakeAll)
      ->expected(1)
      ->type_name(type);
}

void Options::List(const char* name, std::vector<std::string>& values, const std::string& help, const char* type) {
  constexpr int kMost = 1000;
  command_->add_option(name, values, help)->expected(1, kMost)->type_name(type);
}

void Options::Choice(const char* name, std::string& value, const std::vector<std::string>& choices,
                     const std::string& help, const char* type) {
  command_->add_option(name, value, WithDefault(help, value))->check(CLI::IsMember(choices))->type_name(type);
}

void Options::Choice(const char* name, int& value, const std::vector<int>& choices, const std::string& help,
                     const char* type) {
  command_->add_option(name, value, WithDefault(help, std::to_string(value)))
      ->check(CLI::IsMember(choices))
      ->type_name(type);
}

void Options::ChoiceArgument(const char* name, std::string& value, const std::vector<std::string>& choices,
                             const std::string& help) {
  command_->add_option(name, value, help)->required()->check(CLI::IsMember(choices));
}

void Options::Number(const char* name, double& value, double low, double high, const std::string& help,
                     const char* type) {
  const std::string initial = value < low ? "" : Format("%g", value);
  command_->add_option(name, value, WithDefault(help, initial))
      ->check(Within(low, high), "", "finite")
      ->type_name(type);
}

void Options::Number(const char* name, std::optional<double>& value, double low, double high, const std::string& help,
                     const char* type) {
  command_->add_option(name, value, help)->check(Within(low, high), "", "finite")->type_name(type);
}

void Options::Whole(const char* name, int& value, int low, int high, const std::string& help, const char* type) {
  CLI::Option* const option = command_->add_option(name, value, WithDefault(help, std::to_string(value)));
  if (low > INT_MIN || high < INT_MAX) option->check(CLI::Range(low, high));
  option->type_name(type);
}

void Options::Whole(const char* name, std::optional<int>& value, int low, int high, const std::string& help,
                    const char* type) {
  command_->add_option(name, value, help)->check(CLI::Range(low, high))->type_name(type);
}

void Options::Seed(const char* name, std::uint64_t& value, const std::string& help) {
  const auto whole = [](const std::string& text) {
    const bool digits = !text.empty() && text.size() < 19 && text.find_first_not_of("0123456789") == std::string::npos;
    return digits ? std::string() : text + " is no whole number of up to 18 digits";
  };
  command_->add_option(name, value, WithDefault(help, std::to_string(value)))->check(whole)->type_name("N");
}

CommandBody Parse(const ProgramText& text, const std::vector<Command>& commands,
                  const std::vector<std::string>& words) {
  CLI::App app(text.purpose, text.name);
  app.set_version_flag("--version", std::string(text.name) + " " + text.version);
  app.require_subcommand(1);
  app.footer(text.footer);
  app.option_defaults()->multi_option_policy(CLI::MultiOptionPolicy::TakeLast);
  app.get_formatter()->column_width(32);

  CommandBody body;
  for (const Command& row : commands) {
    const std::string name = row.name;
    const std::size_t space = name.find(' ');
    CLI::App* const group = space == std::string::npos ? &app : app.get_subcommand(name.substr(0, space));
    CLI::App* const command = group->add_subcommand(name.substr(space + 1), row.purpose);
    if (!row.declare) {
      command->require_subcommand(1);
      continue;
    }
    Options options(*command);
    command->callback([&body, chosen = row.declare(options)] { body = chosen; });
  }
  try {
    std::vector<std::string> backwards(words.rbegin(), words.rend());  // the parser takes them from the back
    app.parse(backwards);
  } catch (const CLI::ParseError& e) {
    if (e.get_exit_code() != 0) throw Failure(kWrongUsage, Complaint(app, e));
    app.exit(e);  // prints help or version
    return [] { return static_cast<int>(kExitWithinLimits); };
  }
  return body;
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
