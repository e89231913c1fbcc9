#pragma once

// The cloud stand-in's TLS identity, kept in DIR/tls: a certificate authority
// made at first start and a server certificate it issued for "localhost" and
// 127.0.0.1. Later starts reuse both, so that a host which trusts the
// authority keeps trusting the stand-in across restarts.

#include <Poco/Net/Context.h>

#include <string>

struct CloudTlsFiles
{
    std::string authority; // the CA certificate a host trusts (PEM)
    std::string certificate;
    std::string privateKey;
    bool created = false; // made at this start
};

namespace CloudTls
{
// Makes whatever of the files in directory is missing. Throws
// std::runtime_error when they cannot be made or read.
CloudTlsFiles Prepare(const std::string& directory);

// A TLS server context with the certificate and key.
Poco::Net::Context::Ptr ServerContext(const CloudTlsFiles& files);
} // namespace CloudTls
