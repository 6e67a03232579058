// The control file of the projection log as the log itself writes it.
//
// The text is fixed, blanks at the line ends included: a file that is there is never written again,
// so any change would leave two kinds of notes about. The control line at its end, and the example
// in it, have blanks between the groups; the parser takes the form without blanks only. So the file
// as written is off, and stays off until somebody writes a line such as "0110,0000,0000,0001".
#ifndef ZMC_COORDSYS_COORDSYSLOGNOTES_H
#define ZMC_COORDSYS_COORDSYSLOGNOTES_H

namespace zelm {

inline constexpr char kCoordSysLogNotes[] =
    "# -----------------------------------------------------------------------------\n"
    "#              Projection Logging Usage Notes \n"
    "# -----------------------------------------------------------------------------\n"
    "#  - the purpose of this logging feature is to enable the debugging of projection issues. \n"
    "#  - any combination of logging levels can be enabled by setting the corresponding bits to 1 "
    "\n"
    "#  - at least one destination must be set to 1 (file and/or console). \n"
    "#    logging will be disabled if a destination is not selected. \n"
    "#  - there are two alternating log files which are written to in: \n"
    "#    <KVD_DIR>/resource/pedata/logs \n"
    "#  - for example: 0110, 0000, 0000, 0001\n"
    "#                  ||               |- this enables logging of the first geogtran item \n"
    "#                  || - this enables logging all errors \n"
    "#                  | - this enables writing to the log files \n"
    "# \n"
    "#  definition of log levels \n"
    "#  - 0000, 0000, 0000, 0001 = Level 1 = Log first geographic transform \n"
    "#  - 0000, 0000, 0000, 0010 = Level 2 = Log all geographic transforms \n"
    "#  - 0000, 0000, 0000, 0100 = Level 3 = Log coordinate systems strings used during a "
    "geographic transform \n"
    "#  - 0000, 0000, 0000, 1000 = Level 4 = Log the first input/output values for a geographic "
    "transform \n"
    "#  - 0000, 0000, 0001, 0000 = Level 5 = Log overrides for both geographic transforms and "
    "datums \n"
    "#  - 0000, 0000, 0010, 0000 = Level 6 = Log the geographic transform used \n"
    "#  - 0000, 0000, 0100, 0000 = Level 7 = Log the geographic transform bounding box \n"
    "#  - 0000, 0000, 1000, 0000 = Level 8 = \n"
    "#  - 0000, 0001, 0000, 0000 = Level 9 = \n"
    "#  - 0000, 0010, 0000, 0000 = Level 10 = Log core reprojection values \n"
    "#  - 0000, 0100, 0000, 0000 = Level 11 = Log when a coordinate system string/object is "
    "fetched/deleted \n"
    "#  - 0000, 1000, 0000, 0000 = Level 12 = Log when a geographic coordinate system object is "
    "created \n"
    "#  - 0001, 0000, 0000, 0000 = Level 13 = Log when a projected coordinate system object is "
    "created \n"
    "#  - 0010, 0000, 0000, 0000 = Level 14 = Log errors \n"
    "#  - 0100, 0000, 0000, 0000 = Level 15 = Destination: Enable logging to a file \n"
    "#  - 1000, 0000, 0000, 0000 = Level 16 = Destination: Enable logging to a KVD console window "
    "\n"
    "#                                      in core log to win32/64 dev studio output window or "
    "dbmon window \n"
    "#  \n"
    "# Change this line to enable or disable logging features.\n"
    "0000, 0000, 0000, 0000\n";

}  // namespace zelm

#endif
