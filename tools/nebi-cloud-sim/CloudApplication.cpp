#include "CloudApplication.h"

#include "CloudTls.h"
#include "ResourceStore.h"
#include "StopRequest.h"

#include <Poco/Net/HTTPServer.h>
#include <Poco/Net/HTTPServerParams.h>
#include <Poco/Net/SecureServerSocket.h>
#include <Poco/Net/SocketAddress.h>
#include <Poco/NumberParser.h>
#include <Poco/Path.h>
#include <Poco/Util/IntValidator.h>
#include <Poco/Util/OptionException.h>
#include <Poco/Util/OptionSet.h>

#include <memory>

using Poco::Util::Option;

CloudApplication::CloudApplication()
    : StandInApplication("A stand-in of the cloud's REST interface: keeps uploaded settings archives in a directory "
                         "and serves them over HTTPS on 127.0.0.1. At first start it makes its own certificate "
                         "authority and a certificate for localhost and 127.0.0.1; hosts trust the authority's "
                         "certificate, whose path it prints.")
{
}

void CloudApplication::defineOptions(Poco::Util::OptionSet& options)
{
    StandInApplication::defineOptions(options);
    options.addOption(Option("port", "p", "TCP port on 127.0.0.1 (default 8443; 0 picks a free one).")
                          .argument("PORT")
                          .validator(new Poco::Util::IntValidator(0, 65535)));
    options.addOption(Option("data", "d",
                             "Directory of the archives, their metadata and the TLS files "
                             "(default ./nebi-cloud-data).")
                          .argument("DIR"));
    options.addOption(Option("api-key", "", "The API key requests must carry (default demo-api-key).").argument("KEY"));
    options.addOption(
        Option("api-secret", "", "The API secret requests must carry (default demo-api-secret).").argument("SECRET"));
    options.addOption(
        Option("base-path", "", "Path prefix of every endpoint (default /api/clientapp/v1).").argument("PATH"));
    options.addOption(Option("max-archive-mb", "", "Largest archive accepted, in MiB (default 1024).")
                          .argument("MIB")
                          .validator(new Poco::Util::IntValidator(1, 1024 * 1024)));
}

void CloudApplication::handleOption(const std::string& name, const std::string& value)
{
    StandInApplication::handleOption(name, value);
    if (name == "port")
    {
        m_port = static_cast<unsigned short>(Poco::NumberParser::parseUnsigned(value));
    }
    else if (name == "data")
    {
        m_dataDir = value;
    }
    else if (name == "api-key")
    {
        m_settings.apiKey = value;
    }
    else if (name == "api-secret")
    {
        m_settings.apiSecret = value;
    }
    else if (name == "base-path")
    {
        if (value.empty() || value.front() != '/' || value.back() == '/')
        {
            throw Poco::Util::InvalidArgumentException("--base-path must start with \"/\" and not end with it");
        }
        m_settings.basePath = value;
    }
    else if (name == "max-archive-mb")
    {
        m_settings.maxArchiveBytes = Poco::NumberParser::parseUnsigned64(value) * 1024 * 1024;
    }
}

int CloudApplication::Serve()
{
    Poco::Net::initializeSSL();
    const int status = ServeOverHttps();
    Poco::Net::uninitializeSSL();
    return status;
}

int CloudApplication::ServeOverHttps()
{
    const std::string dataDir = Poco::Path(m_dataDir).makeAbsolute().makeDirectory().toString();
    std::unique_ptr<ResourceStore> store;
    CloudTlsFiles tls;
    std::unique_ptr<Poco::Net::SecureServerSocket> socket;
    try
    {
        store = std::make_unique<ResourceStore>(dataDir, logger());
        tls = CloudTls::Prepare(Poco::Path(dataDir).append("tls").toString());
        socket = std::make_unique<Poco::Net::SecureServerSocket>(Poco::Net::SocketAddress("127.0.0.1", m_port), 64,
                                                                 CloudTls::ServerContext(tls));
    }
    catch (const Poco::Exception& e)
    {
        logger().error("cannot start on 127.0.0.1:" + std::to_string(m_port) + " with " + dataDir + ": " +
                       e.displayText());
        return EXIT_UNAVAILABLE;
    }
    catch (const std::exception& e)
    {
        logger().error("cannot start with " + dataDir + ": " + e.what());
        return EXIT_CANTCREAT;
    }

    Poco::Net::HTTPServerParams::Ptr params = new Poco::Net::HTTPServerParams();
    params->setMaxThreads(8);
    Poco::Net::HTTPServer server(new CloudRequestHandlerFactory({m_settings, *store, logger()}), *socket, params);
    // Ctrl+C, SIGTERM or (on Windows) POCO's termination request end the
    // wait below.
    StopRequest stopRequest;
    server.start();

    logger().information("listening on https://127.0.0.1:" + std::to_string(socket->address().port()) +
                         m_settings.basePath);
    logger().information(std::string("CA certificate") + (tls.created ? " (new)" : "") + ": " + tls.authority);
    logger().information("archives in " + dataDir + ": " + std::to_string(store->Count()) + " stored");
    stopRequest.Wait();
    server.stopAll(true);
    logger().information("stopped");
    return EXIT_OK;
}
