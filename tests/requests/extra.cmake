# The readings tests load the simulated transport library by path and by default.
add_dependencies(${target} vantrix32)
