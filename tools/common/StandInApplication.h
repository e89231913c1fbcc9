#pragma once

// What the stand-ins have in common: a POCO application with --help whose
// main() checks the command line, writes its log to the console and then
// serves until it is asked to stop; and RunStandIn(), the whole of a
// stand-in's main().

#include <Poco/Util/Application.h>

#include <functional>
#include <string>
#include <vector>

class StandInApplication : public Poco::Util::Application
{
public:
    // Until main() sets up the console lines, the application's messages go
    // to stderr under the program's name.
    void UseStartupConsole(const std::string& programName);

    // Returns what run() returns. An exception that ends it goes to stderr
    // under the program's name, and the status is then EXIT_USAGE for a bad
    // option and EXIT_SOFTWARE for anything else.
    static int ReportingFailures(const std::string& programName, const std::function<int()>& run);

protected:
    // helpHeader: what --help says the stand-in is.
    explicit StandInApplication(std::string helpHeader);

    // --help. A stand-in with options of its own calls these first.
    void defineOptions(Poco::Util::OptionSet& options) override;
    void handleOption(const std::string& name, const std::string& value) override;

    // Serves until asked to stop (Ctrl+C, SIGTERM, or on Windows POCO's
    // termination request) and returns the exit status; the log goes to the
    // console by then.
    virtual int Serve() = 0;

private:
    // Prints the help, or refuses an argument that is no option, or serves.
    int main(const std::vector<std::string>& args) final;
    void PrintHelp();
    void UseConsoleLogger();

    std::string m_helpHeader;
    bool m_helpRequested = false;
};

// The whole of a stand-in's main(): runs a StandIn (derived from
// StandInApplication) with the command line and returns its exit status.
// Char is wchar_t for wmain() on Windows, which hands main() its arguments in
// the ANSI code page, which cannot hold every name (linked with -municode).
template <class StandIn, class Char>
int RunStandIn(const std::string& programName, int argc, Char** argv)
{
    return StandInApplication::ReportingFailures(programName, [&] {
        StandIn application;
        application.UseStartupConsole(programName);
        application.init(argc, argv); // reads the options
        return application.run();
    });
}
