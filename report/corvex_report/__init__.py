"""One page that tells what is in a log directory, and what is odd about it."""
