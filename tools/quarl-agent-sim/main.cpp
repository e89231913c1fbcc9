// quarl-agent-sim: a stand-in of the local agent, for demonstrations and tests.
// See AgentRequestHandler.h for what it answers and --help for its options.

#include "AgentApplication.h"

#ifdef _WIN32
int wmain(int argc, wchar_t** argv) // the wide command line: see RunStandIn()
#else
int main(int argc, char** argv)
#endif
{
    return RunStandIn<AgentApplication>("quarl-agent-sim", argc, argv);
}
