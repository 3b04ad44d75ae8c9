#include "tools/keldoauth/console/options.h"

#include <CLI/CLI.hpp>
#include <charconv>
#include <system_error>

#include "tools/keldoauth/console/bounds.h"

namespace tool {
namespace {

/// Decimal digits and nothing else: no sign, no base prefix, no blanks.
long long parseNumber(const std::string& text, const Option& option) {
  long long number = 0;
  const char* const end = text.data() + text.size();
  const auto [stop, error] = std::from_chars(text.data(), end, number);
  if (error != std::errc() || stop != end || number < 0) {
    throw CLI::ValidationError(option.name, "'" + text + "' is not a whole number");
  }
  if (number > option.highest) {
    throw CLI::ValidationError(option.name, text + " is above " + std::to_string(option.highest));
  }
  return number;
}

std::string helpOf(const Option& option) {
  if (option.bounds == nullptr) return option.help;
  return std::string(option.help) + ", " + accepted(*option.bounds);
}

struct Declaration {
  const Option& option;
  CLI::App& app;
  Arguments& arguments;
  std::string help = helpOf(option);

  CLI::Option* operator()(bool Arguments::*member) const {
    return app.add_flag(option.name, arguments.*member, help);
  }
  CLI::Option* operator()(Arguments::Text Arguments::*member) const {
    return app.add_option(option.name, arguments.*member, help);
  }
  /// Each time one value: what follows is another argument's.
  CLI::Option* operator()(Arguments::Texts Arguments::*member) const {
    return app.add_option(option.name, arguments.*member, help)->allow_extra_args(false);
  }
  CLI::Option* operator()(Arguments::Numbers Arguments::*member) const {
    const auto take = [this_ = *this, member](const std::vector<std::string>& texts) {
      for (const std::string& text : texts) {
        (this_.arguments.*member).push_back(parseNumber(text, this_.option));
      }
    };
    return app.add_option_function<std::vector<std::string>>(option.name, take, help);
  }
  CLI::Option* operator()(Arguments::Number Arguments::*member) const {
    const auto take = [this_ = *this, member](const std::string& text) {
      this_.arguments.*member = parseNumber(text, this_.option);
    };
    return app.add_option_function<std::string>(option.name, take, help);
  }
};

}  // namespace

void declare(const Option& option, CLI::App& app, Arguments& arguments) {
  CLI::Option* const declared = std::visit(Declaration{option, app, arguments}, option.target);
  declared->required(option.isRequired);
  declared->option_text(std::string(option.placeholder) + (option.isRequired ? " (required)" : ""));
}

}  // namespace tool
