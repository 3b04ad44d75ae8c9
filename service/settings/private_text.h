// Small files of JSON that hold secrets. Whoever cannot read one learns why.

#ifndef KELDOAUTH_SERVICE_SETTINGS_PRIVATE_TEXT_H
#define KELDOAUTH_SERVICE_SETTINGS_PRIVATE_TEXT_H

#include <json/value.h>

#include <cstddef>
#include <string>

namespace keldoauth::service {

struct TextFile {
  std::string text;
  bool isOpenToAll = false;  // others than its owner and its group can read it
};

/// A regular file of at most `most` bytes that not everybody can write to. Throws
/// SettingsFault (settings.h).
TextFile readTextFile(const std::string& path, std::size_t most);

/// Makes a file with mode 0600 that is whole or not there, whatever happens on
/// the way. Never replaces one: throws SettingsFault then, and when it cannot be
/// made.
void makePrivateFile(const std::string& path, const std::string& text);

/// Strict JSON, an object, no key twice; comments are allowed. `path` is for the
/// fault, which says where in the text it is. Throws SettingsFault.
Json::Value parseJsonObject(const std::string& text, const std::string& path);

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_SETTINGS_PRIVATE_TEXT_H
