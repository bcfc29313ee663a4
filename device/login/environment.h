// The variables of the web server's environment that the programs read. Everything else is dropped
// before any library is called: a program of another user must not choose proxies, key log files
// or anything else that a library takes from the environment.
#pragma once

constexpr const char* kRequestVariables[] = {
    "REQUEST_METHOD",       "QUERY_STRING", "HTTP_COOKIE",         "CONTENT_LENGTH",
    "CONTENT_TYPE",         "REMOTE_ADDR",  "SCRIPT_NAME",         "HTTP_HOST",
    "HTTP_ACCEPT_LANGUAGE", "HTTP_ORIGIN",  "HTTP_SEC_FETCH_SITE", "HTTP_SEC_FETCH_DEST"};

constexpr char kPath[] = "/usr/bin:/bin";
