# A test in Python in the current folder: its module, the seconds that only what hangs takes, and its environment.
function(tav_add_python_test name timeout)
  get_filename_component(folder "${CMAKE_CURRENT_SOURCE_DIR}" NAME)
  add_test(NAME ${folder}.${name} COMMAND "${Python3_EXECUTABLE}" -B -m unittest -v ${name})
  set_tests_properties(${folder}.${name} PROPERTIES
    WORKING_DIRECTORY "${CMAKE_CURRENT_SOURCE_DIR}"
    ENVIRONMENT "${ARGN}"
    TIMEOUT ${timeout}
    LABELS ${folder})
endfunction()

# Temporary files of a test where no other one's are, also while another build of the project is tested.
function(tav_give_own_folder test)
  set(folder "${CMAKE_CURRENT_BINARY_DIR}/files/${test}")
  file(MAKE_DIRECTORY "${folder}")
  set_tests_properties(${test} PROPERTIES ENVIRONMENT "TMPDIR=${folder}")
endfunction()
