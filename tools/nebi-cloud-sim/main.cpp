// nebi-cloud-sim: a stand-in of the cloud's REST interface, for demonstrations and tests.
// See CloudRequestHandler.h for what it answers and --help for its options.

#include "CloudApplication.h"

#ifdef _WIN32
int wmain(int argc, wchar_t** argv) // the wide command line: see RunStandIn()
#else
int main(int argc, char** argv)
#endif
{
    return RunStandIn<CloudApplication>("nebi-cloud-sim", argc, argv);
}
