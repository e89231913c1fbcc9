// Starts the connector in a console application, reads the login state and
// the role texts through the public interface, and stops it again.

#include <DorvanNebiConnector/DorvanNebiConnector.h>
#include <DorvanNebiConnector/DorvanNebiConnectorComponent.h>
#include <DorvanNebiConnector/DorvanNebiLoginComponent.h>

#include <wx/app.h>
#include <wx/init.h>

#include <iostream>

int main(int argc, char** argv)
{
    wxApp::SetInstance(new wxAppConsole());
    wxEntryStart(argc, argv);

    DorvanNebiConnectorContext::InitializeDorvanNebiConnector();
    auto login = DorvanNebiConnector::GetInstance()->GetLoginComponent();
    const bool loggedOut = login->GetLoginState() == LoggedOut;
    const bool rolesOk = DorvanNebiConnectorTypes::ToString(DorvanNebiConnectorTypes::FromString("admin")) == "admin";
    DorvanNebiConnectorContext::UninitializeDorvanNebiConnector();

    std::cout << "package host: connector started, " << (loggedOut ? "logged out" : "logged in")
              << ", role texts " << (rolesOk ? "ok" : "WRONG") << std::endl;
    // The connector lives until the process ends; leave without tearing down
    // the application object under its workers.
    std::cout.flush();
    std::_Exit(loggedOut && rolesOk ? 0 : 1);
}
