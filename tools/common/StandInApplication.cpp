#include "StandInApplication.h"

#include <Poco/AutoPtr.h>
#include <Poco/ConsoleChannel.h>
#include <Poco/FormattingChannel.h>
#include <Poco/Logger.h>
#include <Poco/PatternFormatter.h>
#include <Poco/Util/HelpFormatter.h>
#include <Poco/Util/OptionException.h>
#include <Poco/Util/OptionSet.h>

#include <exception>
#include <iostream>
#include <utility>

namespace
{
void WriteLogTo(Poco::Logger& logger, std::ostream& stream, const std::string& pattern)
{
    Poco::AutoPtr<Poco::ConsoleChannel> console(new Poco::ConsoleChannel(stream));
    Poco::AutoPtr<Poco::PatternFormatter> format(new Poco::PatternFormatter(pattern));
    logger.setChannel(new Poco::FormattingChannel(format, console));
}
} // namespace

StandInApplication::StandInApplication(std::string helpHeader) : m_helpHeader(std::move(helpHeader))
{
    // --port and -p everywhere: POCO's default on Windows is /port.
    setUnixOptions(true);
}

void StandInApplication::UseStartupConsole(const std::string& programName)
{
    WriteLogTo(logger(), std::cerr, programName + ": %t");
}

int StandInApplication::ReportingFailures(const std::string& programName, const std::function<int()>& run)
{
    try
    {
        return run();
    }
    catch (const Poco::Util::OptionException& e)
    {
        std::cerr << programName << ": " << e.displayText() << " (see --help)" << std::endl;
        return EXIT_USAGE;
    }
    catch (const std::exception& e)
    {
        std::cerr << programName << ": " << e.what() << std::endl;
    }
    return EXIT_SOFTWARE;
}

void StandInApplication::defineOptions(Poco::Util::OptionSet& options)
{
    Application::defineOptions(options);
    options.addOption(Poco::Util::Option("help", "h", "Print this help and exit."));
}

void StandInApplication::handleOption(const std::string& name, const std::string& value)
{
    Application::handleOption(name, value);
    if (name == "help")
    {
        m_helpRequested = true;
        stopOptionsProcessing();
    }
}

int StandInApplication::main(const std::vector<std::string>& args)
{
    if (m_helpRequested)
    {
        PrintHelp();
        return EXIT_OK;
    }
    if (!args.empty())
    {
        std::cerr << commandName() << ": unexpected argument \"" << args.front() << "\" (see --help)" << std::endl;
        return EXIT_USAGE;
    }
    UseConsoleLogger();
    return Serve();
}

void StandInApplication::PrintHelp()
{
    Poco::Util::HelpFormatter help(options());
    help.setCommand(commandName());
    help.setUnixStyle(true); // --option, as on the command line (POCO's Windows default is /option)
    help.setUsage("[OPTIONS]");
    help.setHeader(m_helpHeader);
    help.setFooter("Stop it with Ctrl+C.");
    help.format(std::cout);
}

void StandInApplication::UseConsoleLogger()
{
    WriteLogTo(logger(), std::cout, "%L%H:%M:%S.%i %t");
}
