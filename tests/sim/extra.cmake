# The shared-library test opens the built transport library by path.
add_dependencies(${target} vantrix32)
