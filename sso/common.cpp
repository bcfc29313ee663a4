#include "sso/common.h"

namespace QOVA {

namespace SSO {

sso_exception::sso_exception(const std::string& message) : std::runtime_error(message) {}
sso_exception::~sso_exception() = default;

sso_err_resp::sso_err_resp(const std::string& message) : sso_exception(message) {}
sso_err_resp::~sso_err_resp() = default;

sso_op_failed::sso_op_failed(const std::string& message) : sso_exception(message) {}
sso_op_failed::~sso_op_failed() = default;

sso_not_implemented::sso_not_implemented(const std::string& message) : sso_exception(message) {}
sso_not_implemented::~sso_not_implemented() = default;

}  // namespace SSO

namespace JWT {

jwt_exception::jwt_exception(const std::string& message) : std::runtime_error(message) {}
jwt_exception::~jwt_exception() = default;

jwt_not_support::jwt_not_support(const std::string& message) : jwt_exception(message) {}
jwt_not_support::~jwt_not_support() = default;

jwt_verify_failed::jwt_verify_failed(const std::string& message) : jwt_exception(message) {}
jwt_verify_failed::~jwt_verify_failed() = default;

}  // namespace JWT

}  // namespace QOVA
