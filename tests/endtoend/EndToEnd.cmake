# End-to-end tests: the demonstration host drives the stand-ins of the local
# agent and of the cloud, each a real process on the loopback address, and
# the stand-ins are asked directly. Included by tests/CMakeLists.txt.
if(TARGET dorvan-nebi-host AND TARGET quarl-agent-sim AND TARGET nebi-cloud-sim)
    dorvan_nebi_add_test_suite(EndToEndTests
        endtoend/Processes.cpp
        endtoend/EndToEndTests.cpp
        endtoend/HostInputTests.cpp
        endtoend/StandInTests.cpp)
    target_link_libraries(EndToEndTests PRIVATE DorvanNebiPki)
    # The programs are found beside the test program at run time
    # (TestSupport::HelperProgram).
    add_dependencies(EndToEndTests quarl-agent-sim nebi-cloud-sim dorvan-nebi-host)
endif()
