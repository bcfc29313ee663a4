#include "session.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <map>
#include <memory>
#include <stdexcept>

#include "identity.h"
#include "random.h"
#include "seal.h"
#include "store.h"

namespace session {
namespace {

// The prefix makes browsers refuse the cookie from any other host, path or transport.
constexpr char kCookie[] = "__Host-session";

constexpr size_t kKeySize = 32;  // bytes
constexpr size_t kLongestFile = 1024;

// The file of the request's session; empty if its cookie cannot be one of ours.
std::string FileOf(const cgi::Request& request) {
  const std::string key = cgi::Value(request.cookies, kCookie);
  return key.size() == 2 * kKeySize ? "/run/ssoclient/sessions/" + Digest(key) : "";
}

// Ends sessions that are too old; and the oldest ones until there is room for one more.
void MakeRoom(const std::string& folder, const Settings& settings) {
  const std::unique_ptr<DIR, int (*)(DIR*)> entries(opendir(folder.c_str()), closedir);
  if (!entries) throw std::runtime_error("cannot read " + folder);
  std::multimap<time_t, std::string> sessions;
  while (const dirent* entry = readdir(entries.get())) {
    struct stat status;
    if (entry->d_name[0] == '.' || stat((folder + entry->d_name).c_str(), &status) != 0) continue;
    sessions.emplace(status.st_mtime, folder + entry->d_name);
  }
  const time_t end = time(nullptr) - settings.session_lifetime;
  const size_t most = static_cast<size_t>(settings.max_sessions);
  for (auto oldest = sessions.begin(); oldest != sessions.end();) {
    if (oldest->first >= end && sessions.size() < most) return;
    unlink(oldest->second.c_str());
    oldest = sessions.erase(oldest);
  }
}

// A file ends with a line feed: one that was cut off is no session.
void Write(const std::string& path, const std::string& user) {
  const std::string text = user + "\n";
  const int file = open(path.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0640);
  if (file < 0) throw std::runtime_error("cannot write a session");
  const bool written = fchmod(file, 0640) == 0 &&
                       write(file, text.data(), text.size()) == static_cast<ssize_t>(text.size());
  close(file);
  if (!written) throw std::runtime_error("cannot write a session");
}

void Remove(const cgi::Request& request) {
  const std::string file = FileOf(request);
  if (!file.empty()) unlink(file.c_str());
}

}  // namespace

std::string Open(const cgi::Request& request, const std::string& user, const Settings& settings) {
  const std::string key = Hex(RandomBytes(kKeySize));
  const AsRoot root;
  const std::string folder = store::Folder("sessions", 0750);
  Remove(request);
  MakeRoom(folder, settings);
  Write(folder + Digest(key), user);
  return cgi::Cookie(kCookie, key);
}

std::optional<Session> Current(const cgi::Request& request, const Settings& settings) {
  const std::string path = FileOf(request);
  const int file = path.empty() ? -1 : open(path.c_str(), O_RDONLY | O_NOFOLLOW | O_CLOEXEC);
  if (file < 0) return std::nullopt;
  struct stat status;
  std::string text(kLongestFile, '\0');
  const ssize_t size = fstat(file, &status) == 0 ? read(file, &text[0], text.size()) : -1;
  close(file);
  if (size < 2 || text[static_cast<size_t>(size) - 1] != '\n') return std::nullopt;
  if (status.st_mtime + settings.session_lifetime < time(nullptr)) return std::nullopt;
  return Session{text.substr(0, static_cast<size_t>(size) - 1), status.st_mtime, Token(request)};
}

std::string Token(const cgi::Request& request) {
  const std::string key = cgi::Value(request.cookies, kCookie);
  return key.size() == 2 * kKeySize ? Digest("form " + key).substr(0, 32) : "";
}

std::string Close(const cgi::Request& request) {
  const AsRoot root;
  Remove(request);
  return cgi::Cookie(kCookie, "");
}

}  // namespace session
