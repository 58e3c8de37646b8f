# Face engine networks: fetched once from the npm registry (npm pack, cached
# outside the build tree so that every preset and every CI run share one
# download), converted into the engine's own weight blob and embedded in the
# library. Nothing is downloaded at run time.
#
# Cache layout (LUMICOR_DEPS_CACHE, default ~/.cache/lumicor):
#   face-api-<ver>/package/...          the unpacked npm package
#   jpeg-js-<ver>/package/...           JPEG decoder for the sample photos
#   face-weights-<hash>/face.bin        converted blob (hash of the converter)
#   face-samples-<ver>/sample*.ppm      decoded sample photos (tests, benchmarks)
set(LUMICOR_FACE_API_VERSION 1.7.15)
set(LUMICOR_JPEG_JS_VERSION 0.4.4)
if(DEFINED ENV{LUMICOR_DEPS_CACHE})
  set(_cache_default "$ENV{LUMICOR_DEPS_CACHE}")
elseif(DEFINED ENV{HOME} AND NOT "$ENV{HOME}" STREQUAL "")
  set(_cache_default "$ENV{HOME}/.cache/lumicor")
else()
  set(_cache_default "${PROJECT_BINARY_DIR}/_deps")
endif()
set(LUMICOR_DEPS_CACHE "${_cache_default}" CACHE PATH "Download cache of the face networks")

find_program(LUMICOR_NODE NAMES node nodejs REQUIRED)
find_program(LUMICOR_NPM NAMES npm REQUIRED)

file(MAKE_DIRECTORY "${LUMICOR_DEPS_CACHE}")
# Presets configured at the same time must not unpack over each other.
file(LOCK "${LUMICOR_DEPS_CACHE}/.lock" GUARD FILE TIMEOUT 600)

# Fetches an npm package tarball into <cache>/<dir> unless it is there.
function(lumicor_npm_fetch spec dir marker)
  set(dest "${LUMICOR_DEPS_CACHE}/${dir}")
  if(EXISTS "${dest}/${marker}")
    return()
  endif()
  set(tmp "${LUMICOR_DEPS_CACHE}/${dir}.download")
  file(REMOVE_RECURSE "${tmp}" "${dest}")
  file(MAKE_DIRECTORY "${tmp}")
  message(STATUS "Fetching ${spec} from the npm registry")
  execute_process(COMMAND "${LUMICOR_NPM}" pack "${spec}" --silent
                  WORKING_DIRECTORY "${tmp}" RESULT_VARIABLE rc OUTPUT_VARIABLE out ERROR_VARIABLE err)
  file(GLOB tgz "${tmp}/*.tgz")
  if(NOT rc EQUAL 0 OR NOT tgz)
    message(FATAL_ERROR "npm pack ${spec} failed (${rc}): ${err}")
  endif()
  file(MAKE_DIRECTORY "${tmp}/x")
  execute_process(COMMAND "${CMAKE_COMMAND}" -E tar xzf "${tgz}" WORKING_DIRECTORY "${tmp}/x" RESULT_VARIABLE rc)
  if(NOT rc EQUAL 0 OR NOT EXISTS "${tmp}/x/${marker}")
    message(FATAL_ERROR "unpacking ${spec} failed")
  endif()
  file(RENAME "${tmp}/x" "${dest}")
  file(REMOVE_RECURSE "${tmp}")
endfunction()

lumicor_npm_fetch("@vladmandic/face-api@${LUMICOR_FACE_API_VERSION}" "face-api-${LUMICOR_FACE_API_VERSION}"
                  "package/model/ssd_mobilenetv1_model.bin")
lumicor_npm_fetch("jpeg-js@${LUMICOR_JPEG_JS_VERSION}" "jpeg-js-${LUMICOR_JPEG_JS_VERSION}" "package/index.js")
set(LUMICOR_FACE_API_DIR "${LUMICOR_DEPS_CACHE}/face-api-${LUMICOR_FACE_API_VERSION}/package")

# Convert (once per converter revision; the armhf build reuses the same blob).
set(_converter "${PROJECT_SOURCE_DIR}/tools/faceweights/convert.js")
set_property(DIRECTORY APPEND PROPERTY CMAKE_CONFIGURE_DEPENDS "${_converter}" "${PROJECT_SOURCE_DIR}/tools/faceweights/samples.js")
file(SHA256 "${_converter}" _conv_hash)
string(SUBSTRING "${_conv_hash}" 0 12 _conv_hash)
set(LUMICOR_FACE_WEIGHTS "${LUMICOR_DEPS_CACHE}/face-weights-${_conv_hash}/face.bin")
if(NOT EXISTS "${LUMICOR_FACE_WEIGHTS}")
  execute_process(COMMAND "${LUMICOR_NODE}" "${_converter}" "${LUMICOR_FACE_API_DIR}/model" "${LUMICOR_FACE_WEIGHTS}"
                  RESULT_VARIABLE rc)
  if(NOT rc EQUAL 0)
    message(FATAL_ERROR "converting the face networks failed")
  endif()
endif()

set(LUMICOR_FACE_SAMPLES_DIR "${LUMICOR_DEPS_CACHE}/face-samples-${LUMICOR_FACE_API_VERSION}")
if(NOT EXISTS "${LUMICOR_FACE_SAMPLES_DIR}/sample6.ppm")
  file(GLOB _photos "${LUMICOR_FACE_API_DIR}/demo/sample*.jpg")
  execute_process(COMMAND "${LUMICOR_NODE}" "${PROJECT_SOURCE_DIR}/tools/faceweights/samples.js"
                          "${LUMICOR_DEPS_CACHE}/jpeg-js-${LUMICOR_JPEG_JS_VERSION}/package"
                          "${LUMICOR_FACE_SAMPLES_DIR}" ${_photos}
                  RESULT_VARIABLE rc OUTPUT_QUIET)
  if(NOT rc EQUAL 0)
    message(WARNING "decoding the sample photos failed; the tests that need them will be skipped")
  endif()
endif()
file(LOCK "${LUMICOR_DEPS_CACHE}/.lock" RELEASE)

# Embed the blob. The generated source names the blob's hash so that a
# compiler cache never reuses an object built from another blob.
file(SHA256 "${LUMICOR_FACE_WEIGHTS}" _blob_hash)
set(_blob_src "${PROJECT_BINARY_DIR}/generated/face_weights_blob.c")
file(WRITE "${_blob_src}.in"
"/* Generated: embeds the face engine weights (sha256 ${_blob_hash}). */
__asm__(
    \"  .section .rodata.lmk_face_weights,\\\"a\\\"\\n\"
    \"  .balign 64\\n\"
    \"  .globl lmk_face_weights_begin\\n\"
    \"  .hidden lmk_face_weights_begin\\n\"
    \"lmk_face_weights_begin:\\n\"
    \"  .incbin \\\"${LUMICOR_FACE_WEIGHTS}\\\"\\n\"
    \"  .globl lmk_face_weights_end\\n\"
    \"  .hidden lmk_face_weights_end\\n\"
    \"lmk_face_weights_end:\\n\"
    \"  .previous\\n\");
")
configure_file("${_blob_src}.in" "${_blob_src}" COPYONLY)
set_source_files_properties("${_blob_src}" PROPERTIES OBJECT_DEPENDS "${LUMICOR_FACE_WEIGHTS}")
target_sources(lumicor_objects PRIVATE "${_blob_src}")
