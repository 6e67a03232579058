# cmake -DZMC_SOURCE=… -DZMC_TEMPLATE=… [-DZMC_FOLDER=…] -P: writes a C++ source with the files of
# the folder; with none where none is told.
cmake_minimum_required(VERSION 3.25)
set(types .html "text/html\\; charset=utf-8" .js "text/javascript\\; charset=utf-8"
    .css "text/css\\; charset=utf-8" .svg image/svg+xml .png image/png .ico image/x-icon
    .json application/json .webmanifest application/manifest+json .woff2 font/woff2
    .wasm application/wasm .txt "text/plain\\; charset=utf-8" .map application/json)
set(files "")
if(ZMC_FOLDER)
    file(GLOB_RECURSE files RELATIVE "${ZMC_FOLDER}" "${ZMC_FOLDER}/*")
    if(NOT "index.html" IN_LIST files)
        message(FATAL_ERROR "${ZMC_FOLDER} has no page")
    endif()
endif()
list(SORT files)
set(ZMC_PAGE_COUNT 0)
set(ZMC_PAGE_ARRAYS "")
set(ZMC_PAGE_ROWS "")
foreach(file IN LISTS files)
    set(name kFile${ZMC_PAGE_COUNT})
    file(READ "${ZMC_FOLDER}/${file}" digits HEX)
    file(SHA256 "${ZMC_FOLDER}/${file}" hash)
    string(SUBSTRING "${hash}" 0 32 version)
    string(REGEX REPLACE "(..)" "0x\\1," bytes "${digits}")
    get_filename_component(ending "${file}" LAST_EXT)
    list(FIND types "${ending}" place)
    set(type application/octet-stream)
    if(place GREATER_EQUAL 0)
        math(EXPR place "${place} + 1")
        list(GET types ${place} type)
    endif()
    string(APPEND ZMC_PAGE_ARRAYS "constexpr unsigned char ${name}[] = {${bytes}0};\n")
    string(APPEND ZMC_PAGE_ROWS
        "    {\"${file}\", \"${type}\", Bytes(${name}, sizeof ${name} - 1), \"${version}\"},\n")
    math(EXPR ZMC_PAGE_COUNT "${ZMC_PAGE_COUNT} + 1")
endforeach()
# Not where nothing has changed, so that nothing is compiled anew.
configure_file("${ZMC_TEMPLATE}" "${ZMC_SOURCE}" @ONLY)
