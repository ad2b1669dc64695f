# Refuses an include that reaches up the layers of src/. Run as a script:
#   cmake -DFAULTBOX_SRC=path/to/src -P cmake/LayerCheck.cmake
# The layers, lowest first; folders in one layer (separated by ':') may
# include each other. Every include of a project header names its folder
# ("config/QFCECU.h"), so the folder tells the layer.
set(layers "platform" "config" "comm" "systems:patterns" "automation")

if(NOT FAULTBOX_SRC)
  message(FATAL_ERROR "LayerCheck: set FAULTBOX_SRC to the src folder")
endif()

set(rank 0)
foreach(layer IN LISTS layers)
  string(REPLACE ":" ";" folders "${layer}")
  foreach(folder IN LISTS folders)
    set(rank_${folder} ${rank})
  endforeach()
  math(EXPR rank "${rank} + 1")
endforeach()

set(violations "")
foreach(layer IN LISTS layers)
  string(REPLACE ":" ";" folders "${layer}")
  foreach(folder IN LISTS folders)
    file(GLOB_RECURSE files "${FAULTBOX_SRC}/${folder}/*.h" "${FAULTBOX_SRC}/${folder}/*.cpp")
    foreach(file IN LISTS files)
      file(STRINGS "${file}" includes REGEX "^[ \t]*#[ \t]*include[ \t]*\"[^\"]+\"")
      foreach(line IN LISTS includes)
        string(REGEX REPLACE "^[ \t]*#[ \t]*include[ \t]*\"([^\"/]+)/.*$" "\\1" target "${line}")
        if(target STREQUAL line)
          continue()  # a header beside the file, no folder named
        endif()
        if(NOT DEFINED rank_${target})
          file(RELATIVE_PATH where "${FAULTBOX_SRC}" "${file}")
          list(APPEND violations "${where}: ${line} (not a layer of the core)")
        elseif(rank_${target} GREATER rank_${folder})
          file(RELATIVE_PATH where "${FAULTBOX_SRC}" "${file}")
          list(APPEND violations "${where}: ${line} (${target} is above ${folder})")
        endif()
      endforeach()
    endforeach()
  endforeach()
endforeach()

if(violations)
  list(JOIN violations "\n  " text)
  message(FATAL_ERROR "Includes that reach up the layers:\n  ${text}")
endif()
