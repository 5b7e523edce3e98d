# Installs the build into a scratch prefix and proves the install usable:
#  (a) docs/examples/c-host through `pkg-config --cflags --libs quorinapi`,
#  (b) docs/examples/cpp-host through find_package(quorinapi),
# each built against the installed files only and run on a real photo; the
# C++ example's second program makes filters and normalizers by name and a
# face model from a host's record.
# Without the data cache both run on a plain frame and the test reports a skip.
cmake_minimum_required(VERSION 3.16)

set(prefix ${WORK_DIR}/prefix)
file(REMOVE_RECURSE ${WORK_DIR})
file(MAKE_DIRECTORY ${WORK_DIR})

function(run what)
  cmake_parse_arguments(A "" "OUTPUT" "COMMAND" ${ARGN})
  execute_process(COMMAND ${A_COMMAND} RESULT_VARIABLE rc OUTPUT_VARIABLE out ERROR_VARIABLE err)
  if(NOT rc EQUAL 0)
    string(REPLACE ";" " " line "${A_COMMAND}")
    message(FATAL_ERROR "${what} failed (${rc}):\n  ${line}\n${out}\n${err}")
  endif()
  if(A_OUTPUT)
    set(${A_OUTPUT} "${out}" PARENT_SCOPE)
  endif()
endfunction()

# Hosts of a sanitized library must load the sanitizer runtime first.
set(sanitize_flags "")
if(SANITIZE)
  set(sanitize_flags -fsanitize=address,undefined)
endif()

run("install" COMMAND ${CMAKE_COMMAND} --install ${BUILD_DIR} --prefix ${prefix})

# Version policy for 0.x: only the same minor version is compatible. Each entry
# is a requested version and whether the installed 0.1.z must accept it.
file(GLOB_RECURSE version_file ${prefix}/*/quorinapiConfigVersion.cmake)
foreach(entry "0.1:TRUE" "0.1.0:TRUE" "0:FALSE" "0.0:FALSE" "0.2:FALSE" "1.0:FALSE")
  string(REPLACE ":" ";" entry "${entry}")
  list(GET entry 0 requested)
  list(GET entry 1 expected)
  string(REPLACE "." ";" parts "${requested}.0.0")
  list(GET parts 0 PACKAGE_FIND_VERSION_MAJOR)
  list(GET parts 1 PACKAGE_FIND_VERSION_MINOR)
  list(GET parts 2 PACKAGE_FIND_VERSION_PATCH)
  set(PACKAGE_FIND_VERSION ${requested})
  set(PACKAGE_VERSION_COMPATIBLE FALSE)
  include(${version_file})
  if(NOT PACKAGE_VERSION_COMPATIBLE STREQUAL expected)
    message(FATAL_ERROR "installed package ${PACKAGE_VERSION}: a request for ${requested} gives "
      "compatible=${PACKAGE_VERSION_COMPATIBLE}, expected ${expected}")
  endif()
endforeach()

# The photo: tracking_faces.jpg of the data cache, three faces.
set(data_dir "$ENV{QUORIN_DATA_DIR}")
if(NOT data_dir)
  set(data_dir "$ENV{HOME}/.cache/quorin")
endif()
set(photo ${data_dir}/photos/tracking_faces.jpg)
set(photo_args "")
set(expected_faces 0)
if(EXISTS ${photo})
  run("converting ${photo}" COMMAND ${PHOTO_TO_PGM} ${photo} ${WORK_DIR}/photo.pgm)
  set(photo_args ${WORK_DIR}/photo.pgm)
  set(expected_faces 3)
endif()

# (a) C through pkg-config.
file(GLOB_RECURSE pc_files ${prefix}/*/quorinapi.pc)
list(LENGTH pc_files pc_count)
if(NOT pc_count EQUAL 1)
  message(FATAL_ERROR "expected one installed quorinapi.pc under ${prefix}, found: ${pc_files}")
endif()
get_filename_component(pc_dir ${pc_files} DIRECTORY)
set(pkg_config ${CMAKE_COMMAND} -E env PKG_CONFIG_PATH=${pc_dir} pkg-config)
run("pkg-config" COMMAND ${pkg_config} --cflags --libs quorinapi OUTPUT flags)
run("pkg-config libdir" COMMAND ${pkg_config} --variable=libdir quorinapi OUTPUT libdir)
string(STRIP "${flags}" flags)
string(STRIP "${libdir}" libdir)
separate_arguments(flags UNIX_COMMAND "${flags}")
if(NOT EXISTS ${libdir}/libquorinapi.so)
  message(FATAL_ERROR "pkg-config names libdir ${libdir}, which holds no libquorinapi.so")
endif()
run("building the C host" COMMAND ${CC} -std=c99 -Wall -Wextra -pedantic -Werror ${sanitize_flags}
  ${SOURCE_DIR}/docs/examples/c-host/detect_faces.c ${flags} -o ${WORK_DIR}/c-host)
run("running the C host" COMMAND ${CMAKE_COMMAND} -E env LD_LIBRARY_PATH=${libdir}
  ${WORK_DIR}/c-host ${photo_args} OUTPUT c_out)
message("C host:\n${c_out}")

# (b) C++ through find_package.
set(cxx_flags "-Werror")
if(SANITIZE)
  set(cxx_flags "${cxx_flags} -fsanitize=address,undefined")
endif()
run("configuring the C++ host" COMMAND ${CMAKE_COMMAND} -S ${SOURCE_DIR}/docs/examples/cpp-host
  -B ${WORK_DIR}/cpp-build -DCMAKE_PREFIX_PATH=${prefix} -DCMAKE_CXX_COMPILER=${CXX}
  "-DCMAKE_CXX_FLAGS=${cxx_flags}" -DCMAKE_FIND_USE_PACKAGE_REGISTRY=OFF)
run("building the C++ host" COMMAND ${CMAKE_COMMAND} --build ${WORK_DIR}/cpp-build)
set(cpp_args ${photo_args})
if(NOT cpp_args)
  # A plain gray frame: no face, but a full run through the detector.
  file(WRITE ${WORK_DIR}/plain.pgm "P5\n64 48\n255\n")
  string(REPEAT "~" 3072 plain)
  file(APPEND ${WORK_DIR}/plain.pgm "${plain}")
  set(cpp_args ${WORK_DIR}/plain.pgm)
endif()
run("running the C++ host" COMMAND ${WORK_DIR}/cpp-build/detect_faces ${cpp_args} OUTPUT cpp_out)
message("C++ host:\n${cpp_out}")

# The factories' program: filters and normalizers made from their descriptions,
# their JSON forms (four filter layouts) and outputs on a fixed signal.
run("running the factories' host" COMMAND ${WORK_DIR}/cpp-build/numeric_blocks OUTPUT blocks_out)
string(CONCAT blocks_expected
  "QV_FILTER1D_GAUSSIAN {\"sigma\":1} 0.0044 0.0584 0.3005 0.6995 0.9416 0.9956\n"
  "QV_FILTER1D_DOG {\"sigmaL\":0.5, \"sigmaH\":1} 0.0044 0.0584 0.1940 -0.1940 -0.0584 -0.0044\n"
  "QV_FILTER2D_GAUSSIAN {\"sigmaHorizontal\":1,\"sigmaVertical\":0.5} 0.1065 0.1065 0.1065 0.8935 0.8935 0.8935\n"
  "QV_FILTER2D_DOG {\"lowerFilter\":{\"sigmaHorizontal\":0.5,\"sigmaVertical\":0.5}, "
  "\"higherFilter\":{\"sigmaHorizontal\":1,\"sigmaVertical\":1}} 0.1940 0.1940 0.1940 -0.1940 -0.1940 -0.1940\n"
  "QV_NORMALIZER_L1 {} 0.3750 -0.5000 0.1250\n"
  "QV_NORMALIZER_L2HYS {\"clipThreshold\":0.5,\"alpha\":0} 0.5259 -0.8251 0.2063\n"
  "null for unknown 1, null for refused 1, JsonError for malformed 1\n"
  "face model of 2 values: 116 IVB bytes\n")
if(NOT blocks_out STREQUAL blocks_expected)
  message(FATAL_ERROR "the factories' host printed:\n${blocks_out}\nexpected:\n${blocks_expected}")
endif()

# Both must report the photo's faces, each with a line.
foreach(host c cpp)
  string(REGEX MATCHALL "face [-0-9]+ [-0-9]+ [-0-9]+ [-0-9]+" lines "${${host}_out}")
  list(LENGTH lines found)
  if(NOT "${${host}_out}" MATCHES "^${expected_faces} faces\n" OR NOT found EQUAL expected_faces)
    message(FATAL_ERROR "the ${host} host reported ${found} face lines, expected ${expected_faces}")
  endif()
endforeach()

if(NOT photo_args)
  message("SKIPPED: ${photo} not found (run scripts/fetch-data.sh); install, builds and plain-frame runs passed")
endif()
