// nebi-cloud-sim: a stand-in of the cloud's REST interface, for demonstrations and tests.
// See CloudRequestHandler.h for what it answers and --help for its options.

#include "CloudApplication.h"

#include <Poco/AutoPtr.h>
#include <Poco/ConsoleChannel.h>
#include <Poco/FormattingChannel.h>
#include <Poco/Logger.h>
#include <Poco/PatternFormatter.h>
#include <Poco/Util/OptionException.h>

#include <exception>
#include <iostream>

#ifdef _WIN32
// The wide command line: Windows hands main() its arguments in the ANSI code
// page, which cannot hold every name. (Linked with -municode.)
int wmain(int argc, wchar_t** argv)
#else
int main(int argc, char** argv)
#endif
{
    try
    {
        CloudApplication application;
        // Until the application sets up its own console lines, its messages
        // go to stderr under the program's name.
        Poco::AutoPtr<Poco::ConsoleChannel> console(new Poco::ConsoleChannel(std::cerr));
        Poco::AutoPtr<Poco::PatternFormatter> format(new Poco::PatternFormatter("nebi-cloud-sim: %t"));
        application.logger().setChannel(new Poco::FormattingChannel(format, console));
        // --port and -p everywhere: POCO's default on Windows is /port.
        application.setUnixOptions(true);
        application.init(argc, argv); // reads the options
        return application.run();
    }
    catch (const Poco::Util::OptionException& e)
    {
        std::cerr << "nebi-cloud-sim: " << e.displayText() << " (see --help)" << std::endl;
        return Poco::Util::Application::EXIT_USAGE;
    }
    catch (const std::exception& e)
    {
        std::cerr << "nebi-cloud-sim: " << e.what() << std::endl;
    }
    return Poco::Util::Application::EXIT_SOFTWARE;
}
