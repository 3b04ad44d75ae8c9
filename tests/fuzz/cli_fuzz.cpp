// Any command line for the administrator's tool, with any standard input. The
// input: the text on standard input, then the arguments.

#include <json/reader.h>
#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <memory>
#include <sstream>
#include <string>
#include <vector>

#include "tests/fuzz/world.h"
#include "utils/oauth_names.h"

/// The tool's own, under another name.
int keldoauth_main(int argc, char** argv);

namespace {

using fuzz::expect;
using fuzz::World;
using Texts = std::vector<std::string>;

constexpr int kUnhealthy = 6;
constexpr int kHighestExit = 8;
constexpr std::size_t kMostArguments = 16;

// Safety ------------------------------------------------------------------------

/// Commands that put whole files in place, which a database in memory is not.
bool isAboutFiles(const std::string& word) {
  return word == "backup" || word == "restore" || word == "rekey";
}

/// Every path that a command opens lies below the current folder, a private one.
std::string harmless(std::string argument) {
  if (argument.rfind('-', 0) == 0) std::replace(argument.begin(), argument.end(), '/', '_');
  while (argument.rfind('/', 0) == 0) argument.erase(0, 1);
  for (std::size_t at = argument.find(".."); at != std::string::npos; at = argument.find("..")) {
    argument.replace(at, 2, "__");
  }
  return fuzz::upToNul(argument);
}

bool enterPrivateFolder() {
  World::instance();  // refuses to run outside private mounts
  std::filesystem::create_directory("/tmp/cli");
  // The tool asks whether the file is there; what is in it lies in memory.
  std::ofstream(KELDOAUTHSERVER::names::kDatabaseFile, std::ios::app).flush();
  return chdir("/tmp/cli") == 0 && unsetenv("COLUMNS") == 0;
}

// Running -----------------------------------------------------------------------

struct Run {
  Texts arguments;
  int exit = 0;
  std::string out;
  std::string err;
};

/// What a stream gets within the scope.
class Capture {
 public:
  explicit Capture(std::ostream& stream) : stream_(stream), before_(stream.rdbuf(text_.rdbuf())) {
    stream_.clear();
  }
  ~Capture() { stream_.rdbuf(before_); }
  Capture(const Capture&) = delete;
  Capture& operator=(const Capture&) = delete;

  [[nodiscard]] std::string text() const { return text_.str(); }

 private:
  std::ostringstream text_;
  std::ostream& stream_;
  std::streambuf* before_;
};

void offerInput(const std::string& text) {
  const std::unique_ptr<FILE, int (*)(FILE*)> file(std::tmpfile(), std::fclose);
  expect(file != nullptr && std::fwrite(text.data(), 1, text.size(), file.get()) == text.size() &&
             std::fflush(file.get()) == 0 && lseek(fileno(file.get()), 0, SEEK_SET) == 0 &&
             dup2(fileno(file.get()), STDIN_FILENO) == STDIN_FILENO,
         "standard input");
}

Run run(const Texts& arguments) {
  Texts texts = arguments;
  std::vector<char*> argv{const_cast<char*>("keldoauth")};
  for (std::string& text : texts) argv.push_back(text.data());
  argv.push_back(nullptr);

  const Capture out(std::cout);
  const Capture err(std::cerr);
  const int exit = keldoauth_main(static_cast<int>(argv.size()) - 1, argv.data());
  return {arguments, exit, out.text(), err.text()};
}

// What holds of every run -----------------------------------------------------------

/// U+0080 to U+009F, as UTF-8 writes them.
bool hasC1Control(const std::string& text) {
  return std::adjacent_find(text.begin(), text.end(), [](char first, char second) {
           return first == '\xc2' && (second & '\xe0') == '\x80';
         }) != text.end();
}

bool isPrintable(const std::string& text) {
  return !hasC1Control(text) && std::all_of(text.begin(), text.end(), [](char c) {
    return c == '\n' || (static_cast<unsigned char>(c) >= ' ' && c != '\x7f');
  });
}

bool has(const Texts& arguments, const std::string& start) {
  return std::any_of(arguments.begin(), arguments.end(),
                     [&](const std::string& text) { return text.rfind(start, 0) == 0; });
}

/// Whether --json stands there as an option and nothing takes it back.
bool wantsJson(const Texts& arguments) {
  const auto is = [&](const char* word) {
    return std::find(arguments.begin(), arguments.end(), word) != arguments.end();
  };
  return is("--json") && !is("--") && !has(arguments, "--json=") && !has(arguments, "-h") &&
         !has(arguments, "--help") && !has(arguments, "--version");
}

void checkJson(const std::string& out) {
  Json::CharReaderBuilder builder;
  Json::CharReaderBuilder::strictMode(&builder.settings_);
  const std::unique_ptr<Json::CharReader> reader(builder.newCharReader());
  Json::Value document;
  expect(reader->parse(out.data(), out.data() + out.size(), &document, nullptr), "the JSON", out);
  expect(std::count(out.begin(), out.end(), '\n') == 1 && out.back() == '\n', "one line", out);
  expect(std::all_of(out.begin(), out.end(), [](char c) { return (c & '\x80') == 0; }), "ASCII",
         out);
}

void check(const Run& run) {
  expect(run.exit >= 0 && run.exit <= kHighestExit, "the exit status", run.err);
  expect(isPrintable(run.out), "control characters on standard output", run.out);
  expect(isPrintable(run.err), "control characters on standard error", run.err);
  if (run.exit != 0 && run.exit != kUnhealthy) {
    expect(!run.err.empty(), "a failure without a word");
    World::instance().expectAgreement("a command that failed");  // nothing happened
  }
  if (wantsJson(run.arguments)) checkJson(run.out);
}

bool listsClients() {
  return run({"client", "list"}).exit == 0;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  static const bool isSafe = enterPrivateFolder();
  expect(isSafe, "a private folder");
  World::instance().startOver();
  static const bool isAtWork = listsClients();
  expect(isAtWork, "a store that the tool finds");

  fuzz::Input input(data, size);
  offerInput(input.text());
  Texts arguments;
  while (!input.rest().empty() && arguments.size() < kMostArguments) {
    arguments.push_back(harmless(input.text()));
    if (isAboutFiles(arguments.back())) arguments.back() = "--help";
  }
  check(run(arguments));
  return 0;
}
