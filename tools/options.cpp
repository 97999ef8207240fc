#include "tools/options.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <array>
#include <cmath>
#include <sstream>

#include "desk/base/failure.h"
#include "desk/base/text.h"
#include "tools/program.h"

namespace qv {

namespace {

using WordCheck = std::function<std::string(const std::string&)>;

WordCheck Within(double low, double high) {
  return [low, high](const std::string& text) {
    double number = NAN;
    const bool read = CLI::detail::lexical_cast(text, number);
    return read && number >= low && number <= high ? "" : text + " is no number from " + RangeText(low, high);
  };
}

WordCheck WholeWithin(int low, int high) {
  return [low, high](const std::string& text) {
    int number = 0;
    const bool read = CLI::detail::lexical_cast(text, number);
    return read && number >= low && number <= high ? "" : text + " is no whole number from " + RangeText(low, high);
  };
}

WordCheck OneOf(const std::vector<std::string>& words) {
  return [words](const std::string& text) {
    const bool known = std::find(words.begin(), words.end(), text) != words.end();
    return known ? "" : "\"" + text + "\" is none of " + Listed(words) + DidYouMean(text, words);
  };
}

// The parser's help, with lines that a terminal shows whole.
class Help : public CLI::Formatter {
 public:
  Help() {
    column_width(kColumn);
    label("Positionals", "Arguments");
    label("SUBCOMMAND", "COMMAND");
  }

  std::string make_subcommand(const CLI::App* command) const override {
    std::ostringstream out;
    CLI::detail::format_help(out, command->get_name(), Wrapped(command->get_description(), kWidth - kColumn), kColumn);
    return out.str();
  }
  std::string make_option_opts(const CLI::Option* option) const override {
    const bool flag = option->get_type_size() == 0;
    return (flag || option->get_positional() ? "" : " " + option->get_type_name()) +
           (option->get_expected_max() > 1 ? " ..." : "");
  }
  std::string make_option_desc(const CLI::Option* option) const override {
    const bool told = option->get_required() && !option->get_positional();
    return Wrapped(option->get_description() + (told ? " (required)" : ""), kWidth - kColumn);
  }

 private:
  static constexpr std::size_t kColumn = 32, kWidth = 99;
};

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

std::string RangeText(double low, double high) { return Format("%.7g to %.7g", low, high); }

std::string Listed(const std::vector<std::string>& words) {
  std::string list;
  for (std::size_t i = 0; i < words.size(); ++i) {
    list += (i == 0 ? "" : i + 1 < words.size() ? ", " : " or ") + words[i];
  }
  return list;
}

std::string InBrackets(const std::string& help, const std::string& initial, const std::string& range) {
  if (initial.empty() && range.empty()) return help;
  return help + " [" + initial + (initial.empty() || range.empty() ? "" : "; ") + range + "]";
}

void Options::Argument(const char* name, std::string& value, const std::string& help) {
  RefuseEmptyName(*command_->add_option(name, value, help)->required());
}

void Options::Arguments(const char* name, std::vector<std::string>& values, const std::string& help, const char* type,
                        bool required) {
  RefuseEmptyName(*command_->add_option(name, values, help)->required(required)->type_name(type), type);
}

void Options::Flag(const char* name, bool& value, const std::string& help) { command_->add_flag(name, value, help); }

void Options::Text(const char* name, std::string& value, const std::string& help, const char* type, bool required) {
  RefuseEmptyName(*command_->add_option(name, value, InBrackets(help, value))->required(required)->type_name(type),
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
  command_->add_option(name, value, InBrackets(help, value, Listed(choices)))
      ->check(OneOf(choices), "")
      ->type_name(type);
}

void Options::Choice(const char* name, int& value, const std::vector<int>& choices, const std::string& help,
                     const char* type) {
  std::vector<std::string> words;
  for (const int choice : choices) words.push_back(std::to_string(choice));
  command_->add_option(name, value, InBrackets(help, std::to_string(value), Listed(words)))
      ->check(OneOf(words), "")
      ->type_name(type);
}

void Options::ChoiceArgument(const char* name, std::string& value, const std::vector<std::string>& choices,
                             const std::string& help) {
  command_->add_option(name, value, InBrackets(help, "", Listed(choices)))->required()->check(OneOf(choices), "");
}

void Options::Number(const char* name, double& value, double low, double high, const std::string& help,
                     const char* type) {
  const std::string initial = value < low ? "" : Format("%g", value);
  command_->add_option(name, value, InBrackets(help, initial, RangeText(low, high)))
      ->check(Within(low, high), "")
      ->type_name(type);
}

void Options::Number(const char* name, std::optional<double>& value, double low, double high,
                     const std::string& initial, const std::string& help, const char* type) {
  command_->add_option(name, value, InBrackets(help, initial, RangeText(low, high)))
      ->check(Within(low, high), "")
      ->type_name(type);
}

void Options::Whole(const char* name, int& value, int low, int high, const std::string& help, const char* type) {
  command_->add_option(name, value, InBrackets(help, std::to_string(value), RangeText(low, high)))
      ->check(WholeWithin(low, high), "")
      ->type_name(type);
}

void Options::Seed(const char* name, std::uint64_t& value, const std::string& help) {
  const auto whole = [](const std::string& text) {
    const bool digits = !text.empty() && text.size() < 19 && text.find_first_not_of("0123456789") == std::string::npos;
    return digits ? std::string() : text + " is no whole number of up to 18 digits";
  };
  command_->add_option(name, value, InBrackets(help, std::to_string(value)))->check(whole)->type_name("N");
}

CommandBody Parse(const ProgramText& text, const std::vector<Command>& commands,
                  const std::vector<std::string>& words) {
  CLI::App app(text.purpose, text.name);
  app.set_version_flag("--version", std::string(text.name) + " " + text.version);
  app.require_subcommand(1);
  app.footer(text.footer);
  app.option_defaults()->multi_option_policy(CLI::MultiOptionPolicy::TakeLast);
  app.formatter(std::make_shared<Help>());

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
