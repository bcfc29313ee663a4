// A login program without its own libcurl. It says when libcurl is in the process, and how
// requests end.
#include <exception>
#include <fstream>
#include <iostream>
#include <string>

#include "sso/azuresso.h"
#include "sso/profile.h"
#include "sso/utils.h"

namespace {

unsigned append(void* data, unsigned size, unsigned count, void* userData) {
  static_cast<std::string*>(userData)->append(static_cast<char*>(data), size * count);
  return size * count;
}

void sayWhetherLoaded(const char* when) {
  std::ifstream maps("/proc/self/maps");
  std::string line;
  bool loaded = false;
  while (std::getline(maps, line)) loaded = loaded || line.find("/libcurl.so") != line.npos;
  std::cout << when << ": " << (loaded ? "loaded" : "not loaded") << "\n";
}

void request(const std::string& url) {
  std::string response;
  try {
    QOVA::SSO::httpGet(url, response, true, append);
    std::cout << "answer: " << response << "\n";
  } catch (const QOVA::SSO::sso_err_resp& e) {
    std::cout << "sso_err_resp: " << e.what() << "\n";
  }
}

}  // namespace

// curl_probe URL...
int main(int count, char** arguments) {
  sayWhetherLoaded("start");
  QOVA::SSO::SSOProfile profile;
  QOVA::SSO::AzureSSOClient client;
  client.GetAccessTokenReqURI(Json::Value());
  QOVA::SSO::GetAzureSSOLogoutURL("https://device.example.net/");
  sayWhetherLoaded("without a request");
  for (int i = 1; i < count; ++i) request(arguments[i]);
  Json::Value keys;
  if (count > 1) client.RequestKeysInfo(arguments[1], keys);
  sayWhetherLoaded("end");
}
