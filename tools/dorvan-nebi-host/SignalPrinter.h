#pragma once

// Connects a slot to every signal of every component of the connector and
// prints each signal as it arrives: time, component, signal and fields.
// The connector raises its signals on the GUI thread, so the slots run there,
// in the order the results were delivered.

#include <boost/signals2/connection.hpp>

#include <vector>

class SignalPrinter
{
public:
    // Connects to the components of the connector, which must exist.
    SignalPrinter();

    SignalPrinter(const SignalPrinter&) = delete;
    SignalPrinter& operator=(const SignalPrinter&) = delete;

private:
    // Disconnected when the printer goes.
    std::vector<boost::signals2::scoped_connection> m_connections;
};
