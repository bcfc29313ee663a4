#include "doctor/codes.h"

#include <strings.h>

#include <string>

namespace doctor {

namespace {

using Secret = SecretVerdict;

constexpr Code Entra(const char* name, unsigned met, const char* meaning, const char* action,
                     Secret secret = Secret::kUnknown) {
  return {CodeSource::kEntra, name, met, meaning, action, secret};
}

constexpr Code Liberty(const char* name, unsigned met, const char* meaning, const char* action,
                       Secret secret = Secret::kUnknown) {
  return {CodeSource::kLiberty, name, met, meaning, action, secret};
}

constexpr Code OAuth(const char* name, unsigned met, const char* meaning, const char* action) {
  return {CodeSource::kOAuth, name, met, meaning, action};
}

// A row a line. "App registrations", "Enterprise applications", "Users" and
// "Conditional Access" are
// menus of the Microsoft Entra admin center; elements and attributes are those of server.xml.
// clang-format off
constexpr Code kCodes[] = {
    // The redirect URI
    Entra("AADSTS50011", kPage, "The redirect URI of the request is not registered for the application.", "Make azure_redirect_uri in azure.conf and the redirect URI under App registrations > the application > Authentication > Web equal, character for character."),
    Entra("AADSTS500112", kToken, "The redirect URI of the token request is not that of the authorization request.", "Use one azure_redirect_uri in azure.conf. Start a new sign-in after changing it."),
    Entra("AADSTS500113", kPage, "The application has no redirect URI.", "Register azure_redirect_uri under App registrations > the application > Authentication > Add a platform > Web."),
    Entra("AADSTS900971", kPage, "No redirect URI was given, and none is registered.", "Set azure_redirect_uri in azure.conf, and register it under App registrations > the application > Authentication > Web."),
    Entra("AADSTS70004", kPage | kRedirect, "The redirect URI is not among the registered ones.", "Register azure_redirect_uri under App registrations > the application > Authentication > Web."),
    Entra("AADSTS90102", kPage, "A URL in the request is not a valid absolute URL.", "Write azure_redirect_uri in azure.conf as a whole https:// URL."),
    Entra("AADSTS50029", kPage, "A URL in the request has a host name with invalid characters.", "Check azure_redirect_uri in azure.conf for blanks and special characters."),
    Entra("AADSTS9002325", kRedirect | kToken, "The redirect URI is registered for a single-page application, which needs PKCE.", "Move the redirect URI from \"Single-page application\" to \"Web\" under App registrations > the application > Authentication."),
    Entra("AADSTS9002327", kToken, "The redirect URI is registered for a single-page application, whose codes only a browser may exchange.", "Move the redirect URI from \"Single-page application\" to \"Web\" under App registrations > the application > Authentication."),
    // The client and its secret
    Entra("AADSTS7000215", kToken, "The client secret is wrong.", "Set azure_client_secret in azure.conf to the secret's value, not to its ID. The value is shown only once: add a new secret under App registrations > the application > Certificates & secrets.", Secret::kRefused),
    Entra("AADSTS7000222", kToken, "The client secret has expired.", "Add a new secret under App registrations > the application > Certificates & secrets, and put its value into azure_client_secret in azure.conf.", Secret::kRefused),
    Entra("AADSTS7000218", kToken, "The request carried no client secret.", "Set azure_client_secret in azure.conf. Register the redirect URI for the platform \"Web\".", Secret::kRefused),
    Entra("AADSTS7000216", kToken, "The request for client credentials carried no client secret.", "Set azure_client_secret in azure.conf.", Secret::kRefused),
    Entra("AADSTS700025", kToken, "The application is a public client, which must not present a secret.", "Register the redirect URI for the platform \"Web\" under App registrations > the application > Authentication, not for \"Mobile and desktop applications\"."),
    Entra("AADSTS70002", kToken, "The credentials of the request were not accepted. Often a second code follows and names the cause.", "Act on the second code. Without one, check azure_client_id and azure_client_secret in azure.conf."),
    Entra("AADSTS50012", kToken, "The authentication of the client failed.", "Use a client secret, not a certificate, and check azure_client_secret in azure.conf."),
    Entra("AADSTS700016", kPage | kToken, "The tenant has no application with this client ID.", "Set azure_client_id in azure.conf to the application (client) ID, and use the tenant in which the application is registered."),
    Entra("AADSTS700011", kPage | kToken, "The application does not exist in this tenant.", "Set azure_client_id in azure.conf to the application (client) ID, and use the tenant in which the application is registered."),
    Entra("AADSTS70001", kPage | kToken, "The application is disabled or unknown in this tenant.", "Check azure_client_id in azure.conf, and Enterprise applications > the application > Properties > \"Enabled for users to sign-in?\"."),
    Entra("AADSTS7000112", kPage | kToken, "The application is disabled.", "Set \"Enabled for users to sign-in?\" to Yes under Enterprise applications > the application > Properties."),
    Entra("AADSTS7000229", kToken, "The application has no enterprise application (service principal) in this tenant.", "Let an administrator sign in once and consent, or create the enterprise application for azure_client_id."),
    Entra("AADSTS1000031", kPage, "The application cannot be accessed at this time.", "Ask the tenant's administrator: the application was blocked or withdrawn."),
    Entra("AADSTS5000224", kPage | kToken, "The tenant was blocked or removed.", "Check the state of the tenant and of its subscription, and azure_tenant_id and the URLs in azure.conf."),
    // The tenant and the URLs
    Entra("AADSTS90002", kPage | kToken, "There is no tenant of this name or ID in this cloud.", "Correct the tenant in azure_tenant_id and in every URL in azure.conf. The ID is on the application's Overview page, as directory (tenant) ID."),
    Entra("AADSTS900023", kPage | kToken, "The tenant in the URL is neither a tenant ID nor a domain name.", "Replace the placeholder or misspelt tenant in the URLs in azure.conf by the directory (tenant) ID."),
    Entra("AADSTS90019", kPage | kToken, "The request does not say which tenant is meant.", "Put the directory (tenant) ID into the URLs in azure.conf."),
    Entra("AADSTS50059", kPage | kToken, "Neither the request nor the credentials say which tenant is meant.", "Put the directory (tenant) ID into the URLs in azure.conf."),
    Entra("AADSTS50128", kPage, "The request names no valid domain or tenant.", "Put the directory (tenant) ID into the URLs in azure.conf, and let the user check the user name."),
    Entra("AADSTS50194", kPage | kToken, "The application is for one tenant, and the URL says \"common\".", "Replace \"common\" by the directory (tenant) ID in the URLs in azure.conf."),
    Entra("AADSTS9001023", kToken, "This kind of request is not allowed at \"common\" or \"consumers\".", "Replace \"common\" or \"consumers\" by the directory (tenant) ID in azure_token_endpoint."),
    Entra("AADSTS90124", kPage | kToken, "The resource is not available at \"common\" or \"consumers\".", "Replace \"common\" or \"consumers\" by the directory (tenant) ID in the URLs in azure.conf."),
    Entra("AADSTS90130", kPage | kToken, "The application is not available at \"common\" or \"consumers\".", "Replace \"common\" or \"consumers\" by the directory (tenant) ID in the URLs in azure.conf."),
    Entra("AADSTS9002332", kPage | kToken, "The application is for work accounts, and the URL says \"consumers\".", "Replace \"consumers\" by the directory (tenant) ID in the URLs in azure.conf."),
    Entra("AADSTS9002346", kPage | kToken, "The application is registered for personal Microsoft accounts only.", "Register it for \"Accounts in this organizational directory only\": its users must be in the tenant of azure_tenant_id."),
    Entra("AADSTS700005", kToken, "The code was issued for another tenant than the token endpoint's.", "Use the same tenant in azure_authorization_endpoint and azure_token_endpoint."),
    Entra("AADSTS90038", kPage | kToken, "The tenant belongs to another (national) cloud.", "Use the host of that cloud in every URL in azure.conf."),
    Entra("AADSTS900382", kToken, "A client with a secret cannot be used from another cloud than its own.", "Use the host of the tenant's own cloud in every URL in azure.conf."),
    Entra("AADSTS900561", kToken | kPage, "The URL was requested with a wrong HTTP method.", "Check that azure_authorization_endpoint and azure_token_endpoint are not swapped. It is harmless after the browser's Back button."),
    Entra("AADSTS90056", kPage | kToken, "The token endpoint received something that is not a token request.", "Check that azure_authorization_endpoint and azure_token_endpoint are not swapped."),
    Entra("AADSTS1002016", kToken, "The connection used TLS 1.0 or 1.1, or 3DES.", "Update OpenSSL and libcurl on the device, and allow TLS 1.2 in their configuration and in any proxy between."),
    // The form of the request
    Entra("AADSTS9002313", kPage | kToken, "The request is malformed; at the token endpoint usually the code.", "Start a new sign-in. If it happens again, check the URLs in azure.conf for a query or blanks."),
    Entra("AADSTS900144", kPage | kToken, "A required parameter is missing from the request.", "The text names the parameter: set the key of azure.conf it is made from (client_id: azure_client_id, redirect_uri: azure_redirect_uri). Check that the login program was called with a code."),
    Entra("AADSTS90014", kPage | kToken, "A required field is empty or missing.", "The text names the field: set the key of azure.conf it is made from. Check that the login program was called with a code."),
    Entra("AADSTS90004", kPage | kToken, "The request is not properly formatted.", "Remove queries and blanks from the URLs in azure.conf."),
    Entra("AADSTS90013", kPage, "The user's input is not valid.", "Let the user start a new sign-in on the device."),
    Entra("AADSTS90015", kPage, "The query of the authorization URL is too long.", "Carry less in the login program's parameters (the state)."),
    Entra("AADSTS90023", kPage | kToken, "The request is not valid.", "Check the URLs in azure.conf, and that all of them are v1.0 or all are v2.0."),
    Entra("AADSTS90100", kPage | kToken, "A parameter is empty or not valid.", "The text names the parameter: correct the key of azure.conf it is made from."),
    Entra("AADSTS90121", kPage | kToken, "The request is empty.", "Check that the browser comes from the device's login page, and the URLs in azure.conf."),
    Entra("AADSTS901002", kPage | kToken, "The v2.0 endpoint does not know the parameter \"resource\".", "Remove the query from azure_authorization_endpoint, or use the v1.0 URLs."),
    Entra("AADSTS70003", kToken, "The grant type is not supported.", "Check that azure_token_endpoint is the token endpoint of the discovery document."),
    Entra("AADSTS70005", kPage | kRedirect, "The response type is not supported.", "Remove the query from azure_authorization_endpoint: the library asks for a code."),
    Entra("AADSTS700054", kRedirect, "The request asked for an ID token at the authorization endpoint, which the application may not do.", "Remove the query from azure_authorization_endpoint: the library asks for a code and needs no implicit grant."),
    Entra("AADSTS70007", kPage | kRedirect, "The response mode is not supported.", "Remove the query from azure_authorization_endpoint."),
    Entra("AADSTS70011", kRedirect | kToken, "The scope is not valid.", "Remove the query from azure_authorization_endpoint: the library asks for the scope \"openid\"."),
    // The code
    Entra("AADSTS54005", kToken, "The code was redeemed before.", "Start a new sign-in. Check that the page is not loaded twice (reload, Back button, a proxy that repeats requests)."),
    Entra("AADSTS70000", kToken, "The code is not valid: mistyped, cut off or for another client.", "Start a new sign-in. Check that the web server passes the whole query to the login program."),
    Entra("AADSTS70008", kToken, "The code has expired.", "Start a new sign-in. If it happens always, look for what delays the return to the device."),
    Entra("AADSTS50089", kToken | kPage, "The sign-in took too long, and its session has expired.", "Start a new sign-in."),
    Entra("AADSTS50173", kToken, "The grant was revoked, for example because the password was changed.", "Let the user sign in again."),
    Entra("AADSTS501481", kToken, "The code verifier does not match the code challenge.", "Remove the query from azure_authorization_endpoint: the library does not use PKCE."),
    // Assignment and consent
    Entra("AADSTS50105", kPage, "The user is not assigned to the application.", "Assign the user or a group under Enterprise applications > the application > Users and groups, or set \"Assignment required?\" to No under Properties."),
    Entra("AADSTS65001", kPage | kRedirect | kToken, "The application has no consent, neither of the user nor of an administrator.", "Let an administrator select \"Grant admin consent\" under App registrations > the application > API permissions, or let the user consent."),
    Entra("AADSTS65004", kRedirect, "The user declined the consent.", "Let the user sign in again and accept, or let an administrator grant consent under App registrations > the application > API permissions."),
    Entra("AADSTS65005", kPage | kRedirect, "The application asks for permissions that its registration does not list or that do not exist.", "Check App registrations > the application > API permissions: User.Read of Microsoft Graph is enough."),
    Entra("AADSTS650052", kPage, "The application needs a service that the organization has not enabled.", "Remove permissions of other services under App registrations > the application > API permissions."),
    Entra("AADSTS650056", kPage, "The application is misconfigured: a permission is not listed, or there is no consent, or the client ID is wrong.", "Add User.Read of Microsoft Graph under App registrations > the application > API permissions, and grant admin consent."),
    Entra("AADSTS650057", kPage | kToken, "The request names a resource that the application's permissions do not list.", "Remove the query from azure_authorization_endpoint, and check App registrations > the application > API permissions."),
    Entra("AADSTS90008", kPage | kRedirect, "The application has no consent; it needs at least to sign users in and read their profile.", "Add User.Read of Microsoft Graph under App registrations > the application > API permissions, and grant admin consent."),
    Entra("AADSTS90093", kPage, "The user may not consent to what the application asks for.", "Let an administrator grant consent under App registrations > the application > API permissions."),
    Entra("AADSTS90094", kPage | kRedirect, "An administrator's consent is required.", "Let an administrator grant consent under App registrations > the application > API permissions."),
    Entra("AADSTS90095", kPage, "The user was asked to request an administrator's consent.", "Let an administrator approve the request, or grant consent under App registrations > the application > API permissions."),
    Entra("AADSTS50146", kRedirect | kToken, "The application must have its own signing key, and has none that is valid.", "Add or renew the application's signing certificate, or remove the custom claims that need it. Add ?appid= and the client ID to azure_wellknown in azure.conf."),
    Entra("AADSTS50003", kPage | kToken, "The signing key or certificate of the application is missing.", "Add the application's signing certificate, or remove the custom claims that need it."),
    // The account
    Entra("AADSTS16000", kPage, "The account in the browser does not exist in this tenant.", "Sign out at the provider and use an account of the tenant, or invite the account under Users > Invite external user."),
    Entra("AADSTS16003", kPage, "The user was not added to this tenant.", "Add the account under Users, or use another account."),
    Entra("AADSTS50020", kPage, "The account is of another tenant or identity provider and is not a guest here.", "Sign out at the provider and use an account of the tenant, or invite the account under Users > Invite external user."),
    Entra("AADSTS50034", kPage, "The tenant has no such account.", "Check the spelling of the user name, and that the URLs in azure.conf name the user's tenant."),
    Entra("AADSTS51004", kPage, "The account does not exist in the directory.", "Check that the URLs in azure.conf name the user's tenant, or invite the account under Users > Invite external user."),
    Entra("AADSTS50014", kPage, "The guest has not accepted the invitation, or the account does not exist here.", "Let the guest accept the invitation, or invite the account again under Users."),
    Entra("AADSTS500571", kPage, "The guest's account is disabled.", "Enable the account under Users > the user > Properties > Account status."),
    Entra("AADSTS50057", kPage, "The account is disabled.", "Enable the account under Users > the user > Properties, or in Active Directory if it is synchronized from there."),
    Entra("AADSTS50053", kPage, "The account is locked after too many attempts, or the address that the sign-in came from is blocked.", "Wait, then let the user sign in with the right password; the sign-in log names which of the two it was."),
    Entra("AADSTS50055", kPage, "The password has expired.", "Let the user set a new password."),
    Entra("AADSTS50144", kPage, "The password in Active Directory has expired.", "Let the user set a new password in Active Directory."),
    Entra("AADSTS50056", kPage, "The account has no password in the directory, or none was given.", "Let the user enter the password again, or reset it."),
    Entra("AADSTS50126", kPage, "The user name or password is wrong.", "Let the user try again, or reset the password."),
    Entra("AADSTS50064", kPage, "The user name or password was not accepted.", "Let the user try again, or reset the password."),
    Entra("AADSTS50135", kPage, "The account is at risk, and its password must be changed.", "Let the user change the password."),
    Entra("AADSTS50133", kPage | kToken, "The session is no longer valid, because the password has expired or was changed.", "Let the user sign in again."),
    Entra("AADSTS50132", kPage | kToken, "The session is no longer valid, because the password has expired or was changed.", "Let the user sign in again."),
    Entra("AADSTS50197", kPage, "The user could not be found.", "Let the user sign out at the provider and sign in again."),
    Entra("AADSTS500208", kPage, "The account's domain does not fit the kind of account that the tenant allows.", "Use a work or school account of the tenant."),
    Entra("AADSTS90072", kPage, "The account is of another tenant and is not a guest here.", "Sign out at the provider and use an account of the tenant, or invite the account under Users > Invite external user."),
    Entra("AADSTS500212", kPage, "The user's own organization does not allow access to this tenant.", "Let the user's organization change its outbound cross-tenant access settings."),
    Entra("AADSTS500213", kPage, "This tenant does not admit users of that organization.", "Change the inbound settings under External Identities > Cross-tenant access settings."),
    Entra("AADSTS50002", kPage, "A proxy restricts which tenants may be used.", "Allow the tenant in the proxy's tenant restrictions."),
    Entra("AADSTS500021", kPage, "A proxy restricts which tenants may be used, and this one is not allowed.", "Allow the tenant in the proxy's tenant restrictions."),
    Entra("AADSTS500022", kPage, "A proxy restricts which tenants may be used, and this one is not allowed.", "Allow the tenant in the proxy's tenant restrictions."),
    // Multifactor authentication and Conditional Access
    Entra("AADSTS50058", kRedirect, "No user is signed in at the provider, and the request does not allow a prompt.", "Remove \"prompt=none\" from azure_authorization_endpoint."),
    Entra("AADSTS50072", kPage, "The user must register a second factor.", "Let the user complete the registration in the browser."),
    Entra("AADSTS50074", kPage | kToken, "The second factor is required and was not given.", "Let the user sign in again and answer the second factor."),
    Entra("AADSTS50076", kPage | kToken, "Multifactor authentication is required by policy or because of a new location.", "Let the user sign in again and answer the second factor."),
    Entra("AADSTS50078", kPage | kToken, "The multifactor authentication has expired.", "Let the user sign in again and answer the second factor."),
    Entra("AADSTS50079", kPage | kToken, "The user must register for multifactor authentication.", "Let the user complete the registration in the browser."),
    Entra("AADSTS50097", kPage, "The user's computer must be authenticated.", "Use a computer that is registered with the tenant, or exempt the application under Conditional Access."),
    Entra("AADSTS50129", kPage, "The user's computer must be registered with the tenant.", "Register the computer, or exempt the application under Conditional Access."),
    Entra("AADSTS50131", kPage, "A Conditional Access policy or the risk detection stopped the sign-in.", "Find the sign-in in the sign-in log, and change the policy that it names under Conditional Access."),
    Entra("AADSTS50140", kPage, "The sign-in was interrupted by the question \"Stay signed in?\".", "None: let the user answer the question."),
    Entra("AADSTS50158", kPage, "An external security check was not passed.", "Let the user complete the external check, or change the policy under Conditional Access."),
    Entra("AADSTS53000", kPage | kToken, "A Conditional Access policy requires a compliant computer.", "Use a compliant computer, or exempt the application under Conditional Access."),
    Entra("AADSTS53001", kPage | kToken, "A Conditional Access policy requires a domain-joined computer.", "Use a domain-joined computer, or exempt the application under Conditional Access."),
    Entra("AADSTS53003", kPage | kRedirect | kToken, "A Conditional Access policy blocks the sign-in.", "Find the sign-in in the sign-in log, and change the policy that it names under Conditional Access. The device's own address may be the reason at the token endpoint."),
    Entra("AADSTS530003", kPage | kToken, "A Conditional Access policy requires a managed computer.", "Use a managed computer, or exempt the application under Conditional Access."),
    Entra("AADSTS530032", kPage | kToken, "A security policy of the tenant blocks the request.", "Check the tenant's security policies under Conditional Access."),
    Entra("AADSTS530035", kPage | kToken, "The tenant's security defaults block the sign-in.", "Check the sign-in log, and Properties > Manage security defaults."),
    Entra("AADSTS53004", kPage, "The user must register for multifactor authentication, which is blocked because of risk.", "Let an administrator clear the risk, then let the user register."),
    Entra("AADSTS53011", kPage, "The user is blocked because of risk in the home tenant.", "Let the home tenant's administrator clear the risk."),
    // Failures of the service
    Entra("AADSTS50000", kPage | kToken, "The sign-in service could not issue a token.", "Try again later. If it stays, open a support ticket with the trace ID."),
    Entra("AADSTS50196", kPage | kToken, "The same request was made too often in a short time.", "Look for a loop between the device's login page and the provider, then wait some minutes."),
    Entra("AADSTS90012", kPage | kToken, "The request timed out at the provider.", "Try again."),
    Entra("AADSTS90024", kPage | kToken, "A transient error of the provider.", "Try again."),
    Entra("AADSTS90033", kPage | kToken, "The provider's directory service is unavailable.", "Try again later."),
    Entra("AADSTS90055", kPage | kToken, "The tenant sends too many requests.", "Wait, and find what sends them."),
    Entra("AADSTS90006", kPage | kToken, "The service is temporarily unavailable.", "Try again later."),
    Entra("AADSTS80001", kPage, "The provider's agent cannot reach Active Directory to check the password.", "Check the servers of the authentication agent."),
    Entra("AADSTS80002", kPage, "Active Directory did not check the password in time.", "Check Active Directory and the servers of the authentication agent."),
    Entra("AADSTS50061", kLogout, "The sign-out request is not valid.", "Check azure_logout_endpoint in azure.conf."),

    // WebSphere Liberty: the client and its secret
    Liberty("CWOAU0061E", kPage, "The provider does not know the client ID.", "Set websphere_client_id in websphere.conf to the name of a client element that is enabled."),
    Liberty("CWOAU0023E", kServerLog, "The provider does not know the client ID, which the message names.", "Set websphere_client_id in websphere.conf to the name of a client element that is enabled."),
    Liberty("CWOAU0024E", kToken | kServerLog, "The client secret is wrong.", "Make websphere_client_secret in websphere.conf and the secret of the client element equal.", Secret::kRefused),
    Liberty("CWOAU0038E", kToken | kServerLog, "Client ID or client secret is wrong.", "Make websphere_client_id and websphere_client_secret in websphere.conf equal to name and secret of the client element.", Secret::kRefused),
    Liberty("CWWKS1406E", kToken, "The client's credentials are missing or wrong.", "Make websphere_client_id and websphere_client_secret in websphere.conf equal to name and secret of the client element. The server's log names which of them.", Secret::kRefused),
    Liberty("CWOAU0031E", kToken, "The client ID of the request is not that of the authenticated client.", "Set websphere_client_id in websphere.conf to the name of the client element, and start a new sign-in."),
    Liberty("CWOAU0063E", kToken, "The request names two different clients.", "Look for a proxy that adds an Authorization header to the device's requests."),
    Liberty("CWOAU0034E", kToken, "A public client asked for client credentials, which only a client with a secret may do.", "Set publicClient=\"false\" and a secret at the client element."),
    Liberty("CWOAU0035E", kToken, "The client is public, and the provider does not allow public clients.", "Set publicClient=\"false\" and a secret at the client element, and the same secret as websphere_client_secret."),
    Liberty("CWOAU0071E", kToken, "The client is public, and this grant type needs a client with a secret.", "Set publicClient=\"false\" and a secret at the client element."),
    Liberty("CWOAU0059E", kToken, "The client of the code is disabled or was removed.", "Set enabled=\"true\" at the client element, and start a new sign-in."),
    Liberty("CWOAU0070E", kPage | kToken, "The provider has no store of clients.", "Check the localStore, databaseStore or customStore of the oauthProvider element, and the server's log."),
    // The redirect URI
    Liberty("CWOAU0062E", kPage, "The redirect URI of the request is not registered for the client, or is not valid.", "Make websphere_redirect_uri in websphere.conf and a redirect element of the client equal, character for character."),
    Liberty("CWOAU0056E", kPage | kServerLog, "The redirect URI of the request is not registered for the client.", "Make websphere_redirect_uri in websphere.conf and a redirect element of the client equal, character for character."),
    Liberty("CWOAU0026E", kPage | kServerLog, "The redirect URI is not a valid absolute URL.", "Write websphere_redirect_uri in websphere.conf as a whole https:// URL."),
    Liberty("CWOAU0055E", kPage | kServerLog, "The redirect URI that is registered for the client is not a valid absolute URL.", "Write a whole https:// URL in the redirect element of the client."),
    Liberty("CWOAU0032E", kToken, "The redirect URI of the token request is not that of the authorization request.", "Use one websphere_redirect_uri in websphere.conf, and start a new sign-in after changing it."),
    Liberty("CWOAU0060E", kToken, "The token request has no redirect URI, but the authorization request had one.", "Set websphere_redirect_uri in websphere.conf, and start a new sign-in."),
    // The code
    Liberty("CWOAU0029E", kToken, "The code is unknown: redeemed before, expired, or issued by another server.", "Start a new sign-in. Check that the page is not loaded twice; members of a cluster must share their store."),
    Liberty("CWOAU0058E", kToken, "The code has expired.", "Start a new sign-in. authorizationCodeLifetime of the oauthProvider element is its lifetime in seconds."),
    Liberty("CWOAU0020E", kToken, "The code was issued to another client.", "Use one client ID for the whole sign-in: check websphere_client_id in websphere.conf."),
    // The form of the request
    Liberty("CWOAU0025E", kToken, "The grant type is not valid.", "Check that websphere_token_endpoint in websphere.conf is the token endpoint of the discovery document."),
    Liberty("CWOAU0052E", kToken, "The provider's configuration does not allow this grant type.", "Add authorization_code to the grantType attribute of the oauthProvider element."),
    Liberty("CWWKS1417E", kToken, "The client may not use this grant type.", "Add authorization_code to the grantTypes of the client element."),
    Liberty("CWOAU0027E", kRedirect | kPage, "The response type is not valid.", "Remove the query from websphere_authorization_endpoint in websphere.conf: the library asks for a code."),
    Liberty("CWOAU0053E", kRedirect | kPage, "The provider's configuration does not allow this response type.", "Allow the response type \"code\" for the client."),
    Liberty("CWWKS1607E", kRedirect | kPage, "The response type is not valid.", "Remove the query from websphere_authorization_endpoint in websphere.conf: the library asks for a code."),
    Liberty("CWOAU0021E", kPage | kRedirect | kToken, "A parameter, mostly the scope, has characters that are not allowed.", "Remove the query from websphere_authorization_endpoint in websphere.conf."),
    Liberty("CWOAU0022E", kPage | kToken, "A parameter comes twice in the request.", "Remove the query from the URLs in websphere.conf."),
    Liberty("CWOAU0030E", kToken, "The token endpoint was requested with a wrong HTTP method.", "Check that websphere_authorization_endpoint and websphere_token_endpoint are not swapped."),
    Liberty("CWOAU0033E", kPage | kToken, "A required parameter is missing from the request.", "The message names the parameter: set the key of websphere.conf it is made from (client_id: websphere_client_id, redirect_uri: websphere_redirect_uri)."),
    Liberty("CWOAU0037E", kPage | kToken, "The URL says http, and the provider requires https.", "Write https:// and the HTTPS port in the URLs in websphere.conf."),
    Liberty("CWOAU0039W", kServerLog, "The URL is not one of the provider's endpoints.", "Check the path of the URLs in websphere.conf: /oidc/endpoint/ and the id of the openidConnectProvider element, then authorize or token."),
    Liberty("CWWKS1412E", kPage | kToken, "The URL names no provider of this server.", "Check the path of the URLs in websphere.conf: /oidc/endpoint/ and the id of the openidConnectProvider element."),
    Liberty("CWWKS1634E", kPage | kToken, "The URL names no provider of this server.", "Check the path of the URLs in websphere.conf: /oidc/endpoint/ and the id of the openidConnectProvider element."),
    Liberty("CWOAU0042E", kRedirect, "The parameter \"prompt\" is not valid.", "Remove the query from websphere_authorization_endpoint in websphere.conf."),
    // Scopes and consent
    Liberty("CWOAU0028E", kRedirect | kToken, "The requested scope exceeds what was granted.", "Set scope=\"openid profile email\" at the client element."),
    Liberty("CWOAU0064E", kPage | kRedirect, "The client is registered for none of the requested scopes.", "Set scope=\"openid profile email\" at the client element."),
    Liberty("CWOAU0068E", kPage | kRedirect, "The client is registered without scopes.", "Set scope=\"openid profile email\" at the client element."),
    Liberty("CWOAU0065E", kPage | kRedirect, "The request has no scope.", "Check that websphere_authorization_endpoint in websphere.conf holds no query and no \"#\"."),
    Liberty("CWWKS1609E", kPage | kRedirect, "The scope \"openid\" is missing.", "Set scope=\"openid profile email\" at the client element."),
    Liberty("CWOAU0072E", kPage | kToken, "A parameter has a value that the configuration does not allow.", "The message names parameter and attribute: correct that attribute of the client element."),
    Liberty("CWOAU0067E", kRedirect, "The user refused the consent, or the request was denied for another reason.", "Let the user accept, or set preAuthorizedScope=\"openid profile email\" at the client element; else see the server's log."),
    // Users
    Liberty("CWOAU0039A", kPage | kServerLog, "The user has none of the roles that are required.", "Add the user, or ALL_AUTHENTICATED_USERS, to the authenticated element of oauth-roles."),
    Liberty("CWOAU0054E", kServerLog, "The user has too many tokens for this client.", "Raise userClientTokenLimit of the oauthProvider element, or wait until tokens expire."),
    Liberty("CWOAU0066E", kToken, "The user has too many tokens for this client.", "Raise userClientTokenLimit of the oauthProvider element, or wait until tokens expire."),
    Liberty("CWOAU0073E", kPage, "An authentication error that the page does not explain.", "Close the browser and sign in again. The cause is in the server's log."),
    // Keys and the provider's own configuration
    Liberty("CWWKS1455E", kToken | kServerLog, "The key for the signature algorithm is missing.", "Set signatureAlgorithm=\"HS256\" at the openidConnectProvider element, and a secret of 32 characters or more at the client element."),
    Liberty("CWWKS1456E", kToken | kServerLog, "The provider cannot create the token; the message says why.", "Act on the message in its brackets. Check signatureAlgorithm of the openidConnectProvider element and the client's secret."),
    Liberty("CWWKS1457E", kToken | kServerLog, "The signature algorithm needs an RSA key.", "Set signatureAlgorithm=\"HS256\" at the openidConnectProvider element: the library verifies with the client secret."),
    Liberty("CWWKS1640W", kServerLog, "The provider has no public key to publish.", "None for this library: with HS256 there is no public key."),
    Liberty("CWOAU0044E", kPage, "The provider found no issuer.", "Check the openidConnectProvider element, and issuerIdentifier if it is set."),
    Liberty("CWOAU0046E", kToken, "The provider found no issuer.", "Check the openidConnectProvider element, and issuerIdentifier if it is set."),
    Liberty("CWWKS1400E", kServerLog, "The configuration of the OAuth provider is not valid.", "Check the oauthProvider element."),
    Liberty("CWWKS1409E", kPage | kToken | kServerLog, "No endpoint service is available.", "Add the feature openidConnectServer-1.0 to featureManager."),
    Liberty("CWWKS1413E", kPage | kToken | kServerLog, "The OAuth provider could not be created.", "Check that oauthProviderRef of the openidConnectProvider element is the id of an oauthProvider element."),
    Liberty("CWWKS1450E", kServerLog, "Two OpenID Connect providers share one OAuth provider, and both are off.", "Give each openidConnectProvider element its own oauthProvider element."),
    Liberty("CWWKS1628E", kPage | kToken | kServerLog, "No OpenID Connect endpoint service is available.", "Add the feature openidConnectServer-1.0 to featureManager."),
    Liberty("CWWKS1629E", kPage | kToken | kServerLog, "There is no OpenID Connect provider of this name.", "Check the path of the URLs in websphere.conf: /oidc/endpoint/ and the id of the openidConnectProvider element."),
    Liberty("CWWKS1630E", kPage | kToken | kServerLog, "The OpenID Connect provider has no OAuth provider.", "Set oauthProviderRef of the openidConnectProvider element to the id of an oauthProvider element."),
    Liberty("CWWKS1632E", kPage | kToken | kServerLog, "The OpenID Connect provider refers to an OAuth provider that does not exist.", "Set oauthProviderRef of the openidConnectProvider element to the id of an oauthProvider element."),
    // Logout
    Liberty("CWWKS1636E", kLogout | kServerLog, "The address to return to after logout is not registered, or the client is unknown because id_token_hint is missing.", "Add the address as postLogoutRedirectUris to the client element, and send the ID token as id_token_hint. The user is signed out in any case, but the browser does not return."),
    Liberty("CWWKS1625E", kLogout | kServerLog, "The ID token in id_token_hint was not accepted.", "Send the ID token of this sign-in and of this provider."),
    Liberty("CWWKS1626E", kLogout | kRedirect | kServerLog, "Another user is signed in than the ID token in id_token_hint names.", "Sign out at the provider, and sign in again."),

    // RFC 6749 and OpenID Connect Core
    OAuth("invalid_request", kPage | kRedirect | kToken, "The request lacks a parameter, has one twice, or is malformed.", "Check the URLs in the settings file for a query or blanks, and that no key is empty."),
    OAuth("invalid_client", kToken, "The client was not accepted: unknown, without authentication, or with a secret that is wrong or has expired.", "See \"error_description\" for the cause. Check client ID and client secret in the settings file, and that the provider takes the secret in the request's body (client_secret_post)."),
    OAuth("invalid_grant", kToken, "The code is unknown, expired, used before, for another client, or for another redirect URI.", "Start a new sign-in. If it happens always, check the redirect URI in the settings file."),
    OAuth("unauthorized_client", kPage | kRedirect | kToken, "The client may not use this kind of request, or the provider does not know it.", "Check the client ID in the settings file; allow the authorization code flow for the client."),
    OAuth("unsupported_grant_type", kToken, "The token endpoint does not know the grant type.", "Check the URL of the token endpoint in the settings file; allow the authorization code flow."),
    OAuth("unsupported_response_type", kRedirect, "The provider does not return codes for this client.", "Allow the authorization code flow (response type \"code\") for the client."),
    OAuth("invalid_scope", kRedirect | kToken, "The provider does not know the scope or does not allow it.", "Allow the scope \"openid\" for the client; for WebSphere also \"profile\" and \"email\"."),
    OAuth("access_denied", kRedirect, "The user or the provider refused.", "Let the user sign in again and consent. See the provider's log for a policy that refuses."),
    OAuth("server_error", kRedirect, "The provider has an internal error.", "Try again. See the provider's log."),
    OAuth("temporarily_unavailable", kRedirect, "The provider is overloaded or under maintenance.", "Try again later."),
    OAuth("interaction_required", kRedirect | kToken, "The user must do something at the provider, for example give a second factor.", "Let the user sign in again. Remove \"prompt=none\" from the authorization endpoint in the settings file."),
    OAuth("login_required", kRedirect, "The user must sign in, and the request does not allow a prompt.", "Remove \"prompt=none\" from the authorization endpoint in the settings file."),
    OAuth("account_selection_required", kRedirect, "The user must choose an account, and the request does not allow a prompt.", "Remove \"prompt=none\" from the authorization endpoint in the settings file."),
    OAuth("consent_required", kRedirect, "The user must consent, and the request does not allow a prompt.", "Remove \"prompt=none\" from the authorization endpoint, or grant consent at the provider."),
    OAuth("invalid_request_uri", kRedirect, "The request refers to a request object that is not valid.", "Remove the query from the authorization endpoint in the settings file."),
    OAuth("invalid_request_object", kRedirect, "The request object is not valid.", "Remove the query from the authorization endpoint in the settings file."),
    OAuth("request_not_supported", kRedirect, "The provider does not support the parameter \"request\".", "Remove the query from the authorization endpoint in the settings file."),
    OAuth("request_uri_not_supported", kRedirect, "The provider does not support the parameter \"request_uri\".", "Remove the query from the authorization endpoint in the settings file."),
    OAuth("registration_not_supported", kRedirect, "The provider does not support the parameter \"registration\".", "Remove the query from the authorization endpoint in the settings file."),
};
// clang-format on

}  // namespace

Rows<Code> Codes() {
  return {kCodes, sizeof kCodes / sizeof *kCodes};
}

const Code* FindCode(std::string_view name) {
  for (const Code& code : kCodes) {
    if (name.size() == std::string_view(code.name).size() &&
        strncasecmp(code.name, name.data(), name.size()) == 0) {
      return &code;
    }
  }
  return nullptr;
}

}  // namespace doctor
