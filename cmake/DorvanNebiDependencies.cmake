# Finds what the connector and its host platform libraries are built on.
# Included by the project itself and, once installed, by DorvanNebiConnectorConfig.cmake.
include(CMakeFindDependencyMacro)

find_dependency(Threads)
# Asio, Signals2, PropertyTree and System are header-only.
find_dependency(Boost 1.74)
find_dependency(Poco COMPONENTS Foundation Net NetSSL Crypto)
# CoreServices reads certificates into OpenSSL's stores (SystemCertificates).
find_dependency(OpenSSL 3)
find_dependency(jsoncpp)

# wxWidgets' find module defines variables, not a target: wrap the base
# library (and nothing of the GUI) into one imported target.
if(NOT TARGET DorvanNebi::wxBase)
    find_package(wxWidgets 3.2 REQUIRED COMPONENTS base)
    add_library(DorvanNebi::wxBase INTERFACE IMPORTED)
    # The find module leaves out wx-config's wxUSE_GUI=0, without which the
    # headers declare the GUI library's classes.
    set_target_properties(DorvanNebi::wxBase PROPERTIES
        INTERFACE_INCLUDE_DIRECTORIES "${wxWidgets_INCLUDE_DIRS}"
        INTERFACE_COMPILE_DEFINITIONS "${wxWidgets_DEFINITIONS};wxUSE_GUI=0"
        INTERFACE_LINK_LIBRARIES "${wxWidgets_LIBRARIES}")
    if(wxWidgets_CXX_FLAGS)
        separate_arguments(_dorvan_wx_flags UNIX_COMMAND "${wxWidgets_CXX_FLAGS}")
        list(FILTER _dorvan_wx_flags EXCLUDE REGEX "^-I")
        set_property(TARGET DorvanNebi::wxBase PROPERTY INTERFACE_COMPILE_OPTIONS "${_dorvan_wx_flags}")
    endif()
endif()
