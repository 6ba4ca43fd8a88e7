// What the TLS side of Channel does with OpenSSL, apart from the channel: for channel-tls.cpp and
// tls-transport.cpp alone.
#pragma once

#include <openssl/ssl.h>

#include <memory>

#include "utils/unique-fd.h"

using UniqueSsl = std::unique_ptr<SSL, FreeWith<SSL_free>>;
using UniqueSslContext = std::unique_ptr<SSL_CTX, FreeWith<SSL_CTX_free>>;

// Writes what OpenSSL has noted about failures of this thread to the log, and empties its list:
// what is left there would be taken for the outcome of a later call.
void LogSslErrors();
