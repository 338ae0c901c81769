# Records through libvarnel_record and replays through libvarnel_replay, loaded by path.
add_dependencies(${target} varnel_record varnel_replay vantrix32)
target_compile_definitions(${target} PRIVATE
  VARNEL_RECORD_PATH="$<TARGET_FILE:varnel_record>"
  VARNEL_REPLAY_PATH="$<TARGET_FILE:varnel_replay>"
  VARNEL_CAPTURE_FIXTURES="${CMAKE_CURRENT_LIST_DIR}/fixtures")
# The command's --record and --replay, run as a user runs them.
add_dependencies(${target} varnel_cli)
target_compile_definitions(${target} PRIVATE VARNEL_CLI_PATH="$<TARGET_FILE:varnel_cli>")
