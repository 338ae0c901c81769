# The thread tests load the shipped simulated transport by path.
add_dependencies(${target} vantrix32)
