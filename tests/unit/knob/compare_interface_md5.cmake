# SPDX-License-Identifier: Apache-2.0
# Changes copies of the headers one at a time and compares the signature that the build would make.
# SOURCE: the source tree. FOLDER: a folder of the test's own.
set(knob ${SOURCE}/platform/knob)
set(public ${SOURCE}/src/platform)

function(signature result)
  execute_process(
    COMMAND ${CMAKE_COMMAND} -DHEADERS=${FOLDER} -DNODES=${FOLDER}/node_list.h
            -DOUTPUT=${FOLDER}/md5.h -P ${knob}/interface_md5.cmake
    RESULT_VARIABLE failed)
  if(failed)
    message(FATAL_ERROR "interface_md5.cmake: ${failed}")
  endif()
  file(READ ${FOLDER}/md5.h text)
  string(REGEX MATCH "[0-9a-f]+\";" sum "${text}")
  set(${result} "${sum}" PARENT_SCOPE)
endfunction()

function(copy_headers)
  file(REMOVE_RECURSE ${FOLDER})
  file(COPY ${public}/knob.h ${public}/knob_status.h ${public}/knob_records.h ${knob}/node_list.h
       DESTINATION ${FOLDER})
endfunction()

function(replace file from to)
  file(READ ${FOLDER}/${file} before)
  string(REPLACE "${from}" "${to}" after "${before}")
  if(after STREQUAL before)
    message(FATAL_ERROR "${file} has no \"${from}\"")
  endif()
  file(WRITE ${FOLDER}/${file} "${after}")
endfunction()

# Replaces a text and expects the signature to be the SAME or ANOTHER one.
function(expect outcome file from to)
  copy_headers()
  replace(${file} "${from}" "${to}")
  signature(sum)
  if(sum STREQUAL original)
    set(seen SAME)
  else()
    set(seen ANOTHER)
  endif()
  if(NOT seen STREQUAL outcome)
    message(SEND_ERROR "${file}: \"${from}\" -> \"${to}\": ${seen} signature")
  endif()
endfunction()

copy_headers()
signature(original)

expect(SAME knob.h "/* Frees a list" "/* Another ** comment; [with] \"signs\" // in it */ /* Frees")
expect(SAME knob.h "KNOB_NodeID node, const" "KNOB_NodeID  node,\n\n    const")
expect(SAME knob_status.h "#endif" "// One more comment.\n#endif")
expect(SAME knob_records.h "uint32_t cpus;" "uint32_t  cpus ; /* how many */")
expect(SAME node_list.h "gets<KNOB_CpuInfo>(getCpuInfo)" "gets<KNOB_CpuInfo>(readCpuInfo)")

expect(ANOTHER knob.h "int64_t value" "int32_t value")
expect(ANOTHER knob.h "KNOB_NODE_sched_groups_delete" "KNOB_NODE_sched_groups_remove")
expect(ANOTHER knob_status.h "0x0BAD0080" "0x0BAD0082")
expect(ANOTHER knob_records.h "int64_t minLimit" "int32_t minLimit")
expect(ANOTHER knob_records.h "reserved0[309]" "reserved0[310]")
expect(ANOTHER knob_records.h "int64_t min;\n  int64_t max;" "int64_t max;\n  int64_t min;")
expect(ANOTHER knob_records.h "pack(push, 1)" "pack(push, 2)")
expect(ANOTHER node_list.h "0x0203" "0x0213")
expect(ANOTHER node_list.h "row(sched_groups_delete," "row(sched_groups_remove,")
