"""What the system tests stand on: a sandbox for the daemon, its peers, and readers of what it leaves behind."""
