// A login program that iddawc serves, settings from the same file.
//   cgi_iddawc redirect|login
#include <iddawc.h>
#include <jansson.h>

#include <cstdio>
#include <cstring>

namespace {

// The session of a program; the settings file's names are the library's.
class Session {
 public:
  Session() : settings(json_load_file("/usr/qova/etc/ssoclient/azure.conf", 0, nullptr)) {
    i_global_init();
    i_init_session(&session);
    i_set_parameter_list(
        &session, I_OPT_RESPONSE_TYPE, I_RESPONSE_TYPE_CODE, I_OPT_SCOPE, "openid", I_OPT_CLIENT_ID,
        text("azure_client_id"), I_OPT_CLIENT_SECRET, text("azure_client_secret"),
        I_OPT_REDIRECT_URI, text("azure_redirect_uri"), I_OPT_AUTH_ENDPOINT,
        text("azure_authorization_endpoint"), I_OPT_TOKEN_ENDPOINT, text("azure_token_endpoint"),
        I_OPT_OPENID_CONFIG_ENDPOINT, text("azure_wellknown"), I_OPT_TOKEN_METHOD,
        I_TOKEN_AUTH_METHOD_SECRET_POST, I_OPT_NONE);
  }
  ~Session() {
    i_clean_session(&session);
    i_global_close();
    json_decref(settings);
  }
  Session(const Session&) = delete;
  Session& operator=(const Session&) = delete;

  bool redirect() {
    if (i_set_parameter_list(&session, I_OPT_STATE_GENERATE, 32, I_OPT_NONCE_GENERATE, 32,
                             I_OPT_NONE) != I_OK ||
        i_build_auth_url_get(&session) != I_OK) {
      return false;
    }
    std::printf("Location: %s\n\n", i_get_str_parameter(&session, I_OPT_REDIRECT_TO));
    return true;
  }

  bool login() {
    i_set_str_parameter(&session, I_OPT_CODE, "0.AXoAcode");
    if (i_get_openid_config(&session) != I_OK || i_run_token_request(&session) != I_OK ||
        i_verify_id_token(&session) != I_OK) {
      return false;
    }
    std::printf("%s\n",
                json_string_value(json_object_get(session.id_token_payload, "unique_name")));
    return true;
  }

 private:
  const char* text(const char* name) const {
    return json_string_value(json_object_get(settings, name));
  }

  json_t* const settings;
  struct _i_session session;
};

}  // namespace

int main(int count, char** arguments) {
  Session session;
  const bool login = count > 1 && std::strcmp(arguments[1], "login") == 0;
  if (login ? session.login() : session.redirect()) return 0;
  std::fprintf(stderr, "cgi_iddawc: failed\n");
  return 1;
}
