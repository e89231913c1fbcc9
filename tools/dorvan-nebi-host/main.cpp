// dorvan-nebi-host: a small console host of the Dorvan Nebi connector, and
// the sample to copy from. Run it with --help for its commands.
//
// What a host does, in the order it happens here:
//   1. create its wxWidgets application object (HostApp.cpp);
//   2. set up the TLS client context for the cloud (ClientTls.cpp);
//   3. call InitializeDorvanNebiConnector() on its GUI thread (HostApp.cpp);
//   4. connect its slots to the components' signals (SignalPrinter.cpp);
//   5. call the components' operations and match each result signal to the
//      request id the operation returned (ConnectorOperations.cpp);
//   6. run its event loop, which delivers every result (HostApp.cpp);
//   7. call UninitializeDorvanNebiConnector() at the end (HostApp.cpp).

#include "HostApp.h"

#include <wx/init.h>

#include <cstdlib>
#include <iostream>

#ifdef _WIN32
// The wide command line: Windows hands main() its arguments in the ANSI code
// page, which turns names such as "Ωmega ✓ 設定" into question marks; the
// wxWidgets application then takes them from here. (Linked with -municode.)
int wmain(int argc, wchar_t** argv)
#else
int main(int argc, char** argv)
#endif
{
    HostApp* app = new HostApp();
    wxApp::SetInstance(app);
    if (!wxEntryStart(argc, argv))
    {
        std::cerr << "dorvan-nebi-host: wxWidgets could not start" << std::endl;
        return HostApp::kExitFailed;
    }
    int status = HostApp::kExitFailed;
    if (app->CallOnInit())
    {
        status = app->OnRun();
        app->OnExit();
    }
    else
    {
        status = app->ExitStatus(); // --help, or why it could not start
    }
    // The connector lives until the process ends, and so do its worker
    // threads, which may still be busy (the start-up query retries for a few
    // seconds when the agent is down) and deliver to the application object.
    // So the process ends here, without destroying that object or anything
    // static under their feet.
    std::cout.flush();
    std::cerr.flush();
    std::_Exit(status);
}
