// Faults of the device itself: the login program, its store and settings, and the files.
#include <sys/mount.h>
#include <sys/prctl.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <unistd.h>

#include <csignal>
#include <cstdlib>
#include <filesystem>
#include <fstream>

#include "doctor_faults.h"

namespace test {
namespace {

namespace fs = std::filesystem;

constexpr uid_t kWebUser = 33;
constexpr gid_t kWebGroup = 33;
constexpr char kWeb[] = "/usr/qova/web/";

void must(bool good) {
  if (!good) std::abort();
}

void write(const std::string& path, const std::string& text, mode_t mode = 0644, uid_t owner = 0,
           gid_t group = 0) {
  std::ofstream(path) << text;
  must(chown(path.c_str(), owner, group) == 0 && chmod(path.c_str(), mode) == 0);
}

// Starts the doctor for a program of this name.
void useProgram(Site& site, const std::string& name) {
  site.arguments = {"--offline", "--timeout", "2", "--program", kWeb + name};
}

// The program of cgi_program.c under this name, as it should be installed.
std::string installProgram(Site& site, const std::string& name,
                           const std::string& from = CGI_PROGRAM) {
  fs::create_directories(kWeb);
  const std::string path = kWeb + name;
  fs::copy_file(from, path);
  must(chown(path.c_str(), 0, kWebGroup) == 0 && chmod(path.c_str(), 04750) == 0);
  useProgram(site, name);
  return path;
}

void installText(Site& site, const std::string& text, mode_t mode = 0755) {
  fs::create_directories(kWeb);
  write(std::string(kWeb) + "login.cgi", text, mode, 0, kWebGroup);
  useProgram(site, "login.cgi");
}

SeededFault local(const std::string& name, const std::function<void(Site&)>& seed,
                  const std::string& id, const std::string& grade, const std::string& cause,
                  const std::string& action) {
  const int status = grade == "failure" ? 1 : grade == "unchecked" ? 3 : 0;
  SeededFault fault{name, seed, id, grade, "", action, status, Proof::kNone};
  fault.cause = cause;
  return fault;
}

// --- the login program

std::vector<SeededFault> startFaults() {
  const auto program = [](const std::function<void(const std::string&)>& spoil) {
    return [spoil](Site& site) { spoil(installProgram(site, "ok.cgi")); };
  };
  const auto text = [](const std::string& content, mode_t mode = 0755) {
    return [content, mode](Site& site) { installText(site, content, mode); };
  };
  std::string other_machine(64, '\0');
  other_machine.replace(0, 20,
                        std::string("\x7f"
                                    "ELF\2\1\1\0\0\0\0\0\0\0\0\0\2\0\xf3\0",
                                    20));
  return {
      local("StartOfAnotherGroup", program([](const std::string& p) {
              must(chown(p.c_str(), 0, 0) == 0 && chmod(p.c_str(), 04750) == 0);
            }),
            "program-not-started", "failure", "www-data: /usr/qova/web/ok.cgi is closed",
            "chown root:GROUP"),
      local("StartInAClosedFolder",
            program([](const std::string&) { must(chmod(kWeb, 0700) == 0); }),
            "program-not-started", "failure", "/usr/qova/web is closed", "chmod a+x /usr/qova/web"),
      local(
          "StartOnNoexec",
          [](Site& s) {
            mkdir(kWeb, 0755);
            must(mount("web", kWeb, "tmpfs", MS_NOEXEC, "mode=755") == 0);
            installProgram(s, "ok.cgi");
          },
          "program-not-started", "failure", "mounted noexec", "without noexec"),
      local("StartOfAnotherMachine", text(other_machine, 04755), "program-not-started", "failure",
            "another processor", "built for this device"),
      local("StartOfAnEmptyFile", text("", 04755), "program-not-started", "failure",
            "is an empty file", "Install"),
      local("StartWithoutInterpreterLine", text("echo hello\n"), "program-not-started", "failure",
            "neither a program nor a script", "first line"),
      local("StartWithCrLf", text("#!/bin/sh\r\necho\r\n"), "program-not-started", "failure",
            "CR LF", "sed -i"),
      local("StartWithCrLfThroughEnv", text("#!/usr/bin/env sh\r\necho\r\n"), "program-not-started",
            "failure", "CR LF", "sed -i"),
      local("StartWithoutItsInterpreter", text("#!/usr/bin/no-such-shell\n"), "program-not-started",
            "failure", "needs /usr/bin/no-such-shell", "Install it"),
      local(
          "StartIsAFolder",
          [](Site& s) {
            fs::create_directories(std::string(kWeb) + "login.cgi");
            useProgram(s, "login.cgi");
          },
          "program-missing", "failure", "is not a file", "Name the installed"),
      local(
          "StartOfADanglingLink",
          [](Site& s) {
            fs::create_directories(kWeb);
            fs::create_symlink("/nowhere", std::string(kWeb) + "login.cgi");
            useProgram(s, "login.cgi");
          },
          "program-missing", "failure", "cannot be found", "Name the installed"),
      local(
          "StartWithoutTheLibrary", [](Site& s) { installProgram(s, "login.cgi", LINKED_PROGRAM); },
          "program-library", "failure", "cannot load libssoclient.so.1", "ldconfig"),
      local(
          "StartWithNoNewPrivileges",
          [](Site& s) {
            installProgram(s, "ok.cgi");
            prctl(PR_SET_NO_NEW_PRIVS, 1, 0, 0, 0);
          },
          "program-no-new-privs", "failure", "this command itself", "NoNewPrivileges=no"),
      local(
          "StartInAUnitWithNoNewPrivileges",
          [](Site& s) {
            installProgram(s, "ok.cgi");
            coverFolder("/run");
            const std::string folder = "/run/systemd/system";
            fs::create_directories(folder);
            mkdir((folder + "/nginx.service.d").c_str(), 0755);
            write(folder + "/nginx.service.d/hardening.conf", "[Service]\nNoNewPrivileges=yes\n");
          },
          "program-no-new-privs", "failure", "hardening.conf", "daemon-reload"),
      local("StartOfASetIdScript", text("#!/bin/sh\necho 'Status: 200'\necho\n", 04755),
            "program-not-set-id", "failure", "is a script", "compiled"),
      local("StartOfAScript", text("#!/bin/sh\necho 'Status: 200'\necho\n"), "program-not-checked",
            "unchecked", "no root by itself", "--program"),
      local("StartOfAScriptWithoutItsTarget", text("#!/bin/sh\nexec /usr/libexec/no-login\n"),
            "program-no-answer", "failure", "no-login: not found", "Fix what it reports"),
  };
}

std::vector<SeededFault> answerFaults() {
  const auto program = [](const std::string& name) {
    return [name](Site& site) { installProgram(site, name); };
  };
  return {
      local(
          "RunForRoot",
          [](Site& s) {
            installProgram(s, "internal.cgi");
            s.arguments.insert(s.arguments.end(), {"--user", "root"});
          },
          "program-error", "failure", "runs as root", "a separate user"),
      local("RunHangs", program("hang.cgi"), "program-silent", "failure", "within 2 s",
            "system log"),
      local("RunCrashes", program("crash.cgi"), "program-crashed", "failure", "Segmentation fault",
            "same release"),
      local("RunIsMute", program("mute.cgi"), "program-no-answer", "failure", "exit status 3",
            "system log"),
      local("RunComplains", program("complain.cgi"), "program-no-answer", "failure",
            "cannot open the session store", "Fix what it reports"),
      local("RunIsNoCgi", program("text.cgi"), "program-bad-answer", "failure", "\"hello\"",
            "header lines"),
      local("RunFails", program("broken.cgi"), "program-error", "failure", "HTTP 500", "log"),
      local("RunFailsInside", program("internal.cgi"), "program-error", "failure", "internal",
            "K7M2P9QA"),
      local("LauncherWithoutTarget", program("launcher.cgi"), "program-launcher", "failure",
            "launcher", "SSOCLIENT_LOGIN_PROGRAM"),
      local(
          "ProgramWritable",
          [](Site& s) {
            const std::string path = installProgram(s, "ok.cgi");
            must(chmod(path.c_str(), 04770) == 0);
          },
          "program-writable", "warning", "can become root", "chmod go-w /usr/qova/web/ok.cgi"),
      local(
          "ProgramFolderWritable",
          [](Site& s) {
            installProgram(s, "ok.cgi");
            must(chmod(kWeb, 0777) == 0);
          },
          "program-writable", "warning", "/usr/qova/web is writable", "chmod go-w"),
      local(
          "LibraryFolderWritable",
          [](Site& s) {
            installProgram(s, "ok.cgi");
            fs::create_directories("/usr/qova/lib");
            must(chown("/usr/qova/lib", 33, 33) == 0);
          },
          "program-writable", "warning", "libssoclient.so.1", "chown root /usr/qova/lib"),
  };
}

// --- what the reference program keeps

std::vector<SeededFault> keptFaults() {
  const auto conf = [](const std::string& text, mode_t mode = 0644, uid_t owner = 0) {
    return [text, mode, owner](Site& site) {
      site.arguments = {"--offline", "--user", "www-data"};
      writeConfig("login.conf", text, mode, owner);
    };
  };
  const auto store = [](const std::function<void()>& spoil, const char* options = "mode=755") {
    return [spoil, options](Site& site) {
      site.arguments = {"--offline"};
      coverFolder("/run");
      mkdir("/run/ssoclient", 0755);
      must(mount("store", "/run/ssoclient", "tmpfs", 0, options) == 0);
      spoil();
    };
  };
  std::vector<SeededFault> faults = {
      local("ConfOfAnotherOwner", conf("", 0644, 33), "login-conf-unusable", "failure",
            "users other than root", "chown root:root"),
      local("ConfWritable", conf("", 0664), "login-conf-unusable", "failure",
            "users other than root", "chmod 0644"),
      local("ConfPrivate", conf("", 0600), "login-conf-unusable", "failure",
            "cannot be read by www-data", "chmod a+r"),
      local(
          "ConfIsAFolder",
          [](Site& s) {
            s.arguments = {"--offline"};
            mkdir(configPath("login.conf").c_str(), 0755);
          },
          "login-conf-unusable", "failure", "not a regular file", "regular file"),
      local("ConfTooLarge", conf(std::string(70000, '#')), "login-conf-unusable", "failure",
            "larger than 64 KB", "Remove"),
      local("ConfKeyMisspelt", conf("dead_line = 30\n"), "login-conf-ignored", "warning", "line 1",
            "Rename it to \"deadline\""),
      local("ConfByteOrderMark",
            conf("\xEF\xBB\xBF"
                 "deadline = 30\n"),
            "login-conf-ignored", "warning", "a byte-order mark", "Rename it to \"deadline\""),
      local(
          "ConfNearMiss",
          [](Site& s) {
            s.arguments = {"--offline"};
            writeConfig("Login.conf", "deadline = 30\n", 0644);
          },
          "login-conf-ignored", "warning", "does not read", "mv '"),
      local("ConfKeyUnknown", conf("# x\n\nflavour = 3\n"), "login-conf-ignored", "warning",
            "line 3", "Remove it"),
      local("ConfNumberTooLarge", conf("deadline = 9999\n"), "login-conf-ignored", "warning",
            "\"deadline\"", "1 to 600"),
      local("ConfNumberInWords", conf("max_exchanges = many\n"), "login-conf-ignored", "warning",
            "\"max_exchanges\"", "1 to 1000"),
      local("ConfWordUnknown", conf("nonce_check = off\n"), "login-conf-ignored", "warning",
            "\"nonce_check\"", "yes no"),
      local("ConfWithoutEquals", conf("deadline 30\n"), "login-conf-ignored", "warning", "no \"=\"",
            "key = value"),
      local("ConfLookupMissing", conf("user_lookup = /usr/bin/no-such-lookup\n"),
            "login-conf-unusable", "failure", "No such file", "installed command"),
      local("ConfLookupUnknown", conf("user_lookup = ldap\n"), "login-conf-unusable", "failure",
            "user_lookup", "none, nss"),
      local("StoreOfAnotherOwner", store([] { must(chown("/run/ssoclient", 33, 33) == 0); }),
            "store-unsafe", "failure", "owner 33", "rm -r /run/ssoclient"),
      local("StoreFolderWritable", store([] {
              mkdir("/run/ssoclient/sessions", 0755);
              must(chmod("/run/ssoclient/sessions", 0777) == 0);
            }),
            "store-unsafe", "failure", "/run/ssoclient/sessions", "rm -r"),
      local("StoreKeyIsALink", store([] { fs::create_symlink("/tmp/key", "/run/ssoclient/key"); }),
            "store-unsafe", "failure", "/run/ssoclient/key is not a regular file",
            "rm -r /run/ssoclient/key"),
      local("StoreKeyOfAnother", store([] { write("/run/ssoclient/key", "0123", 0600, 33); }),
            "store-writable", "warning", "owner 33", "chown root /run/ssoclient/key"),
      local("StoreReadOnly", store([] {
              must(mount("", "/run/ssoclient", "", MS_REMOUNT | MS_RDONLY, "mode=755") == 0);
            }),
            "store-read-only", "failure", "read-only", "remount,rw"),
      local("StoreWithoutFiles", store([] {}, "mode=755,nr_inodes=1"), "store-full", "failure",
            "file", "df -i"),
      local(
          "StoreWithoutBlocks",
          store([] { write("/run/ssoclient/all", std::string(100000, 'x')); }, "mode=755,size=16k"),
          "store-full", "failure", "block", "df /run/ssoclient"),
  };
  faults.push_back(local(
      "DeadlineShort",
      [](Site& s) {
        writeConfig("login.conf", "deadline = 1\n", 0644);
        s.probeAnswers["/token"] = failed(400, R"({"error":"invalid_request"})");
        s.probeAnswers["/token"].delayMs = 1500;
      },
      "deadline-short", "failure", "after 1 s", "\"deadline\""));
  return faults;
}

// --- files

std::vector<SeededFault> fileFaults() {
  const auto instead = [](bool profile, const std::function<void(const std::string&)>& make) {
    return [profile, make](Site& site) {
      (profile ? site.profileMissing : site.settingsMissing) = true;
      site.arguments = {"--offline", "--timeout", "3"};
      make(configPath(profile ? "profile.conf" : "azure.conf"));
    };
  };
  const auto near = [](bool profile, const std::string& name) {
    return [profile, name](Site& site) {
      (profile ? site.profileMissing : site.settingsMissing) = true;
      site.arguments = {"--offline"};
      write(name[0] == '/' ? name : configPath(name), "{}", 0600);
    };
  };
  const auto fifo = [](const std::string& path) { must(mkfifo(path.c_str(), 0644) == 0); };
  const auto device = [](const std::string& path) { fs::create_symlink("/dev/zero", path); };
  const auto folder = [](const std::string& path) { mkdir(path.c_str(), 0755); };
  const auto listen = [](const std::string& path) {
    sockaddr_un address{AF_UNIX, ""};
    path.copy(address.sun_path, sizeof address.sun_path - 1);
    const int socket = ::socket(AF_UNIX, SOCK_STREAM, 0);
    must(bind(socket, reinterpret_cast<sockaddr*>(&address), sizeof address) == 0);
  };
  const auto dangling = [](const std::string& path) { fs::create_symlink("/nowhere", path); };
  std::vector<SeededFault> faults = {
      local("SettingsAreAFifo", instead(false, fifo), "file-unreadable", "failure", "named pipe",
            "regular file"),
      local("SettingsAreADevice", instead(false, device), "file-unreadable", "failure", "a device",
            "regular file"),
      local("SettingsAreAFolder", instead(false, folder), "file-unreadable", "failure",
            "a directory", "regular file"),
      local("SettingsAreASocket", instead(false, listen), "file-unreadable", "failure", "a socket",
            "regular file"),
      local("ProfileIsAFifo", instead(true, fifo), "file-unreadable", "failure", "named pipe",
            "regular file"),
      local("ProfileIsADevice", instead(true, device), "file-unreadable", "failure", "a device",
            "regular file"),
      local("SettingsLinkDangles", instead(false, dangling), "file-missing", "failure",
            "symbolic link", "readlink"),
      local("ProfileLinkDangles", instead(true, dangling), "file-missing", "failure",
            "symbolic link", "readlink"),
      local("SettingsTooLarge",
            instead(false,
                    [](const std::string& path) {
                      write(path, "{}", 0600);
                      must(truncate(path.c_str(), off_t{3} << 30) == 0);
                    }),
            "file-unreadable", "failure", "3072 MB", "regular file"),
      local(
          "FolderMissing",
          [](Site& s) {
            s.profileMissing = s.settingsMissing = true;
            s.arguments = {"--offline"};
            const std::string mounted = configPath("");
            if (umount(mounted.c_str()) != 0) must(errno == EINVAL);
            must(rename("/usr/qova/etc", "/usr/qova/moved") == 0);
          },
          "file-missing", "failure", "The folder of the settings", "mkdir -p"),
      local(
          "SettingsLinkedFromTmp",
          [](Site& s) {
            s.settingsMissing = true;
            s.arguments = {"--offline"};
            mkdir("/usr/qova/open", 0755);
            must(chmod("/usr/qova/open", 0777) == 0);
            write("/usr/qova/open/azure.conf", compact(s.settings), 0600);
            fs::create_symlink("/usr/qova/open/azure.conf", configPath("azure.conf"));
          },
          "folder-writable", "warning", "/usr/qova/open is writable", "chmod go-w /usr/qova/open"),
      local(
          "ProfileInAClosedFolder",
          [](Site& s) {
            s.arguments = {"--offline", "--user", "www-data"};
            must(chmod("/usr/qova/etc", 0700) == 0);
          },
          "profile-private", "failure", "/usr/qova/etc is closed", "chmod a+rx /usr/qova/etc"),
  };
  for (const char* name :
       {"Azure.conf", "azure.conf.txt", "azure.conf~", "azure.conf.bak", "azur.conf", "azure.json",
        "azure", "/usr/qova/etc/azure.conf", "az\xD1\x83re.conf"}) {
    faults.push_back(local("Near" + std::to_string(faults.size()), near(false, name),
                           "file-missing", "failure", "but \"", std::string(name) + "' /usr/qova"));
  }
  faults.push_back(local("NearProfile", near(true, "profile.conf.save"), "file-missing", "failure",
                         "but \"", "mv '"));
  return faults;
}

// --- what is in the files

std::vector<SeededFault> textFaults() {
  const auto change = [](const std::function<std::string(std::string)>& edit) {
    return [edit](Site& site) {
      site.arguments = {"--offline"};
      site.settingsText = edit(compact(site.settings));
    };
  };
  const auto replaced = [change](const std::string& from, const std::string& to) {
    return change([from, to](std::string text) {
      must(text.find(from) != std::string::npos);
      return text.replace(text.find(from), from.size(), to);
    });
  };
  const auto set = [](const std::string& key, const Json::Value& value) {
    return [key, value](Site& site) {
      site.arguments = {"--offline"};
      site.settings[key] = value;
    };
  };
  const std::string id = "azure_client_id";
  const std::string text_id = kClient;
  return {
      local("TextNoBreakSpace", replaced(":", ":\xC2\xA0"), "file-syntax", "failure",
            "a no-break space (U+00A0)", "plain"),
      local("TextZeroWidthSpace", replaced(",", ",\xE2\x80\x8B"), "file-syntax", "failure",
            "a zero-width space (U+200B)", "plain"),
      local("TextTypographicQuotes", replaced("\"azure_client_id\"", "\u201Cazure_client_id\u201D"),
            "file-syntax", "failure", "typographic quotation mark", "plain"),
      local("TextBehindWithKeys",
            replaced(",\"azure_client_secret\"", "},{\"azure_client_secret\""), "file-odd",
            "failure", "behind the closing brace", "behind the last member"),
      local("TextKeyTwice", replaced("{", "{\"azure_client_id\":\"x\","), "file-odd", "warning",
            "\"azure_client_id\" is given twice", "Remove"),
      local("TextNested",
            change([](const std::string& text) { return "{\"azure\":" + text + "}"; }),
            "file-nested", "failure", "under \"azure\"", "directly between"),
      local("TextOfTheOtherProvider", change([](const std::string& text) {
              std::string other = text;
              for (size_t at; (at = other.find("\"azure_")) != std::string::npos;) {
                other.replace(at, 7, "\"websphere_");
              }
              return other;
            }),
            "file-of-another", "failure", "holds the settings of websphere.conf", "sso_profile"),
      local("TextZerosBehind",
            change([](const std::string& text) { return text + std::string(100, '\0'); }),
            "file-odd", "warning", "behind the closing brace", "Remove"),
      local("KeyWithCyrillicLetter",
            replaced("azure_client_id",
                     "azure_cl\xD1\x96"
                     "ent_id"),
            "key-unknown", "failure", "a Cyrillic letter (U+0456)",
            "Rename it to \"azure_client_id\""),
      local("KeyInFullWidth",
            replaced("azure_tenant_id", "\uFF41\uFF5A\uFF55\uFF52\uFF45_tenant_id"), "key-unknown",
            "failure", "full-width", "Rename it to \"azure_tenant_id\""),
      local("KeyWithZeroWidthSpace", replaced("azure_wellknown", "azure_\xE2\x80\x8Bwellknown"),
            "key-unknown", "failure", "zero-width", "Rename it to \"azure_wellknown\""),
      local("KeyWithBlank", replaced("\"azure_client_id\"", "\"azure_client_id \""), "key-unknown",
            "failure", "not a key", "Rename it to \"azure_client_id\""),
      local("KeyOfTheOtherProvider", replaced("azure_client_id", "websphere_client_id"),
            "key-unknown", "failure", "not a key", "Rename it to \"azure_client_id\""),
      local("KeyInUpperCase", replaced("azure_client_id", "AZURE_CLIENT_ID"), "key-unknown",
            "failure", "not a key", "Rename it to \"azure_client_id\""),
      local(
          "ProfileWithCyrillicLetter",
          [](Site& s) {
            s.arguments = {"--offline"};
            s.profile["sso_profile"] = "\xD0\xB0zure";
          },
          "profile-unsupported", "failure", "a Cyrillic letter (U+0430)", "to \"azure\""),
      local(
          "ProfileWithBlank",
          [](Site& s) {
            s.arguments = {"--offline"};
            s.profile["sso_profile"] = "azure ";
          },
          "profile-unsupported", "failure", "\"azure \"", "to \"azure\""),
      local("ValueWithBlank", set(id, text_id + " "), "value-space", "failure", "blank",
            "Remove the blank"),
      local("ValueWithTab", set("azure_tenant_id", "\t" + std::string(kTenant)), "value-space",
            "failure", "blank", "Remove the blank"),
      local("ValueInQuotes", set(id, "'" + text_id + "'"), "value-quoted", "failure",
            "quotation marks", "inner"),
      local("SecretInQuotes", set("azure_client_secret", "\"" + std::string(kSecret) + "\""),
            "value-quoted", "failure", "quotation marks", "inner"),
      local("ValueWithNoBreakSpace", set(id, text_id + "\xC2\xA0"), "value-odd", "failure",
            "a no-break space (U+00A0)", "plain ASCII"),
      local("ValueWithCyrillicLetter",
            set("azure_tenant_id", "\xD0\xB0" + std::string(kTenant + 1)), "value-odd", "failure",
            "a Cyrillic letter (U+0430)", "plain ASCII"),
      local("UrlWithZeroWidthSpace",
            set("azure_token_endpoint", "https://login.example.net/\xE2\x80\x8Btoken"), "value-odd",
            "failure", "a zero-width space", "plain ASCII"),
      local("SecretWithByteOrderMark",
            set("azure_client_secret",
                "\xEF\xBB\xBF"
                "b8Q~kept"),
            "value-odd", "failure", "a byte-order mark", "plain ASCII"),
      local("PlaceholderId", set(id, "<client-id>"), "value-placeholder", "failure",
            "\"<client-id>\"", "client ID"),
      local("PlaceholderWord", set("azure_client_secret", "changeme"), "value-placeholder",
            "failure", "placeholder", "client secret"),
      local("PlaceholderCrosses", set("azure_client_secret", "xxxxxxxx"), "value-placeholder",
            "failure", "placeholder", "client secret"),
      local("PlaceholderZeros", set("azure_tenant_id", "00000000-0000-0000-0000-000000000000"),
            "value-placeholder", "failure", "placeholder", "tenant"),
      local("PlaceholderInUrl",
            set("azure_token_endpoint", "https://login.example.net/{tenant}/oauth2/v2.0/token"),
            "value-placeholder", "failure", "{tenant}", "token endpoint"),
      local("PlaceholderOfTheExample", set("azure_client_secret", "the value of the client secret"),
            "value-placeholder", "failure", "placeholder", "Set \"azure_client_secret\""),
      local(
          "EnableInQuotes",
          [](Site& s) {
            s.arguments = {"--offline"};
            s.profile["sso_enable"] = "true";
          },
          "key-wrong-type", "failure", "a string", "to true"),
  };
}

}  // namespace

std::vector<SeededFault> localFaults() {
  std::vector<SeededFault> all;
  for (const auto& group :
       {startFaults(), answerFaults(), keptFaults(), fileFaults(), textFaults()}) {
    all.insert(all.end(), group.begin(), group.end());
  }
  return all;
}

}  // namespace test
