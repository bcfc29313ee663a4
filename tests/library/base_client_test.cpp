// SSOClient: its settings, its hooks, and the shape of its dispatch table.
#include <dlfcn.h>
#include <gtest/gtest.h>
#include <link.h>

#include <cstring>
#include <utility>

#include "sso/azuresso.h"
#include "sso/profile.h"
#include "sso/sso.h"
#include "sso/webspheresso.h"
#include "support/log.h"
#include "support/memory_spy.h"
#include "support/throws.h"

namespace {

using namespace QOVA::SSO;

// A provider client as another program would write it: it fills the settings.
struct Settings : SSOClient {
  Settings() {
    enable = true;
    clientID = "client";
    clientSecret = "secret";
    redirectURI = "redirect";
    authEndpoint = "auth";
    tokenEndpoint = "token endpoint";
    logoutEndpoint = "logout";
    wellknownEndpoint = "wellknown";
    code = "code";
    token = "token";
  }
  using SSOClient::authEndpoint;
  using SSOClient::clientID;
  using SSOClient::clientSecret;
  using SSOClient::code;
  using SSOClient::enable;
  using SSOClient::logoutEndpoint;
  using SSOClient::redirectURI;
  using SSOClient::token;
  using SSOClient::tokenEndpoint;
  using SSOClient::wellknownEndpoint;
};

struct Accessor {
  const char* name;
  std::string (SSOClient::*get)();
  const char* value;
};
const Accessor kAccessors[] = {
    {"client ID", &SSOClient::GetClientID, "client"},
    {"client secret", &SSOClient::GetClientSecret, "secret"},
    {"redirect URI", &SSOClient::GetRedirectURI, "redirect"},
    {"token", &SSOClient::GetToken, "token"},
    {"authorization endpoint", &SSOClient::GetAuthEndpoint, "auth"},
    {"token endpoint", &SSOClient::GetTokenEndpoint, "token endpoint"},
    {"well-known endpoint", &SSOClient::GetWellknownEndpoint, "wellknown"},
    {"logout endpoint", &SSOClient::GetLogoutEndpoint, "logout"},
};

TEST(Client, StartsDisabledAndEmpty) {
  SSOClient client;
  EXPECT_FALSE(client.isEnable());
  for (const Accessor& each : kAccessors) EXPECT_EQ((client.*each.get)(), "") << each.name;
}

TEST(Client, AccessorsAnswerTheirOwnSetting) {
  Settings client;
  EXPECT_TRUE(client.isEnable());
  for (const Accessor& each : kAccessors) EXPECT_EQ((client.*each.get)(), each.value) << each.name;
}

TEST(Client, AccessorsReturnCopies) {
  Settings client;
  for (const Accessor& each : kAccessors) {
    std::string copy = (client.*each.get)();
    copy += " changed";
    EXPECT_EQ((client.*each.get)(), each.value) << each.name;
  }
}

TEST(Client, SettersStoreAnyTextAsItIs) {
  Settings client;
  for (const std::string& text : {std::string("x"), std::string(), std::string("a\0b", 3)}) {
    client.SetCode(text);
    EXPECT_EQ(client.code, text);
    client.SetRedirectURI(text);
    EXPECT_EQ(client.GetRedirectURI(), text);
  }
}

TEST(Client, SettersChangeNothingElse) {
  Settings client;
  client.SetCode("new code");
  client.SetRedirectURI("new redirect");
  EXPECT_TRUE(client.isEnable());
  for (const Accessor& each : kAccessors) {
    const bool changed = std::string(each.name) == "redirect URI";
    EXPECT_EQ((client.*each.get)(), changed ? "new redirect" : each.value) << each.name;
  }
}

// The settings of a provider's client as another object holds them: all of them, and no hooks.
testing::AssertionResult hasAllSettings(SSOClient* client) {
  if (!client->isEnable()) return testing::AssertionFailure() << "enable flag";
  for (const Accessor& each : kAccessors) {
    if ((client->*each.get)() != each.value) return testing::AssertionFailure() << each.name;
  }
  return testing::AssertionSuccess();
}

TEST(Client, CopiesHaveAllSettings) {
  const Settings original;
  SSOClient copy(original);
  SSOClient assigned;
  assigned = original;
  EXPECT_TRUE(hasAllSettings(&copy));
  EXPECT_TRUE(hasAllSettings(&assigned));
  copy.SetRedirectURI("changed");
  EXPECT_EQ(assigned.GetRedirectURI(), "redirect");
  EXPECT_EQ(original.redirectURI, "redirect");
}

TEST(Client, MovesTakeAllSettings) {
  Settings original;
  SSOClient moved(std::move(original));
  EXPECT_TRUE(hasAllSettings(&moved));
  SSOClient assigned;
  assigned = std::move(moved);
  EXPECT_TRUE(hasAllSettings(&assigned));
}

TEST(Client, HooksAreNotImplementedAndSaySo) {
  SSOClient client;
  std::string user = "before";
  test::Log log;
  EXPECT_TRUE(test::throws<sso_not_implemented>("VerifyIDToken not implemented",
                                                [&] { client.VerifyIDToken(); }));
  EXPECT_TRUE(test::throws<sso_not_implemented>("GetIDTokenReqParams not implemented",
                                                [&] { client.GetIDTokenReqParams(); }));
  EXPECT_TRUE(test::throws<sso_not_implemented>("GetUserName not implemented",
                                                [&] { client.GetUserName(user); }));
  EXPECT_TRUE(test::throws<sso_not_implemented>("ProcessTokenResponse not implemented", [&] {
    client.ProcessTokenResponse(R"({"id_token":"x"})");
  }));
  EXPECT_EQ(user, "before");
  EXPECT_EQ(client.GetToken(), "");
  EXPECT_TRUE(log.isEmpty());
}

// What the Itanium C++ ABI says of an object with virtual functions: its first word leads to the
// table. Which operation has which slot: layout_test.
void* const* tableOf(const void* object) {
  return *static_cast<void* const* const*>(object);
}

// The number of functions in a table, from the size of its symbol: two words come before them.
std::size_t lengthOf(const void* object) {
  Dl_info info;
  ElfW(Sym)* symbol = nullptr;
  if (dladdr1(tableOf(object), &info, reinterpret_cast<void**>(&symbol), RTLD_DL_SYMENT) == 0 ||
      symbol == nullptr) {
    return 0;
  }
  return symbol->st_size / sizeof(void*) - 2;
}

TEST(DispatchTable, HasNoOtherSlots) {
  const SSOClient base;
  const AzureSSOClient azure;
  const WebSphereSSOClient websphere;
  const SSOProfile profile;
  EXPECT_EQ(lengthOf(&base), 18u);
  EXPECT_EQ(lengthOf(&azure), 20u);  // the destructor takes two: with and without delete
  EXPECT_EQ(lengthOf(&websphere), 20u);
  EXPECT_EQ(lengthOf(&profile), 2u);
}

TEST(DispatchTable, ProvidersOverrideTheFourHooksAlone) {
  const SSOClient base;
  const AzureSSOClient azure;
  const WebSphereSSOClient websphere;
  for (std::size_t slot = 1; slot <= 18; ++slot) {
    const bool hook = slot >= 14 && slot <= 17;
    const void* const own = tableOf(&base)[slot - 1];
    EXPECT_EQ(tableOf(&azure)[slot - 1] != own, hook) << "slot " << slot;
    EXPECT_EQ(tableOf(&websphere)[slot - 1] != own, hook) << "slot " << slot;
    if (!hook) continue;
    EXPECT_NE(tableOf(&azure)[slot - 1], tableOf(&websphere)[slot - 1]) << "slot " << slot;
  }
}

// The library's own function is in a slot, not just a name in a header: reached as a device
// program reaches it, by its number.
TEST(DispatchTable, LeadsToTheOperationsThemselves) {
  Settings client;
  using Getter = std::string (*)(SSOClient*);
  const struct {
    std::size_t slot;
    const char* value;
  } getters[] = {{2, "client"}, {3, "secret"},         {4, "redirect"},  {5, "token"},
                 {6, "auth"},   {7, "token endpoint"}, {8, "wellknown"}, {9, "logout"}};
  for (const auto& each : getters) {
    EXPECT_EQ(reinterpret_cast<Getter>(tableOf(&client)[each.slot - 1])(&client), each.value);
  }
  using Flag = bool (*)(SSOClient*);
  EXPECT_TRUE(reinterpret_cast<Flag>(tableOf(&client)[0])(&client));
}

// The memory of a client's redirect URI.
struct RedirectUri : SSOClient {
  static const void* memoryOf(const SSOClient* client) {
    return (client->*&RedirectUri::redirectURI).data();
  }
};

// The destructors follow the operations: the first one leaves the object's own memory, the second
// one gives that back too.
template <typename Client>
void expectDestroyedThroughItsSlots() {
  using Destructor = void (*)(void*);
  const std::string uri(1000, 'u');
  for (const bool frees : {false, true}) {
    SCOPED_TRACE(frees);
    void* const memory = ::operator new(sizeof(Client));
    auto* const client = new (memory) Client;
    client->SetRedirectURI(uri);
    const Destructor destructor = reinterpret_cast<Destructor>(tableOf(client)[frees ? 19 : 18]);
    const test::Watched text(RedirectUri::memoryOf(client));
    const test::Watched object(memory);
    destructor(client);
    EXPECT_EQ(text.deletions(), 1);
    EXPECT_EQ(object.deletions(), frees ? 1 : 0);
    if (!frees) ::operator delete(memory);
  }
}

TEST(DispatchTable, ProvidersAreDestroyedThroughTheirOwnLastSlots) {
  expectDestroyedThroughItsSlots<AzureSSOClient>();
  expectDestroyedThroughItsSlots<WebSphereSSOClient>();
  const AzureSSOClient azure;
  const WebSphereSSOClient websphere;
  for (const std::size_t slot : {18u, 19u})
    EXPECT_NE(tableOf(&azure)[slot], tableOf(&websphere)[slot]) << "slot " << slot + 1;
}

}  // namespace
