#include "settings.h"

#include <cstdlib>
#include <cstring>

Settings ReadSettings() {
  Settings settings;
  if (const char* road = std::getenv("SSO_LOGIN_ROAD")) {
    settings.plain = std::strcmp(road, "plain") == 0;
  }
  if (const char* deadline = std::getenv("SSO_LOGIN_DEADLINE")) {
    const int seconds = std::atoi(deadline);
    if (seconds >= 1 && seconds <= 600) settings.deadline = seconds;
  }
  return settings;
}
