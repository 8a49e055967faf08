cmake_minimum_required(VERSION 3.25)
# Checks that LIBRARY exports exactly the names of EXPORTS, defines none of the
# functions it imports, and does not depend on the in-tree stand-ins.
find_program(NM nm REQUIRED)
find_program(READELF readelf REQUIRED)

file(STRINGS ${EXPORTS} expected REGEX "^AN[A-Za-z]+$")
list(SORT expected)

execute_process(COMMAND ${NM} -D --defined-only ${LIBRARY} OUTPUT_VARIABLE nm_out
                RESULT_VARIABLE rc)
if(NOT rc EQUAL 0)
  message(FATAL_ERROR "nm failed on ${LIBRARY}")
endif()
string(REPLACE "\n" ";" lines "${nm_out}")
set(actual "")
foreach(line IN LISTS lines)
  if(line MATCHES "^[0-9a-fA-F]+ [TtWwDdBbRrVv] (.+)$")
    list(APPEND actual ${CMAKE_MATCH_1})
  endif()
endforeach()
list(SORT actual)
if(NOT actual STREQUAL expected)
  message(FATAL_ERROR "exports differ\n expected: ${expected}\n actual:   ${actual}")
endif()

foreach(imported DAGetAnno DARetrieveDocHandle DALockModuleData DAUnlockModuleData
        DADestroyModuleData DAGetHChunker DAGetOption DAOpenDocument DASetOption
        DACloseDocument UTGetOSCharSet CHGetItem CHNextItemId CHGetItemId CHGetItemCount
        CHGetItemCountById CHGetRunFromItemId CHGetRunInfo CHGetSectionInfo CAOpenContent
        CAReadFirst CAReadNext CASeek CACloseContent GetProcessHeap HeapAlloc HeapReAlloc
        HeapFree GlobalAlloc GlobalLock GlobalUnlock GlobalFree DisableThreadLibraryCalls)
  if(imported IN_LIST actual)
    message(FATAL_ERROR "the library defines ${imported}")
  endif()
endforeach()

execute_process(COMMAND ${READELF} -d ${LIBRARY} OUTPUT_VARIABLE dyn)
if(dyn MATCHES "anno_toolkit" OR dyn MATCHES "anno_winapi")
  message(FATAL_ERROR "the library depends on a stand-in:\n${dyn}")
endif()
if(dyn MATCHES "SYMBOLIC")
  message(FATAL_ERROR "the library is linked with -Bsymbolic")
endif()
list(LENGTH actual count)
message(STATUS "${count} exports, as listed")
