# Copies HEADERS, paths below FROM with commas between, to the folder TO and nothing else: what is
# there of an earlier list goes. Each includes the others by their installed names.
cmake_minimum_required(VERSION 3.25)
file(REMOVE_RECURSE ${TO})
string(REPLACE "," ";" HEADERS "${HEADERS}")
foreach(header IN LISTS HEADERS)
    file(READ ${FROM}/${header} text)
    string(REGEX REPLACE "#include \"([^\"]+)\"" "#include <zmcraster/\\1>" text "${text}")
    file(WRITE ${TO}/${header} "${text}")
endforeach()
