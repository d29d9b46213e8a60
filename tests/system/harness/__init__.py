"""Support code of the system tests: a sandbox for the daemon, its peers, readers for its log, movies and documents."""
