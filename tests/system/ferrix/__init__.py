"""A private little box for whole-daemon scenarios: file systems, devices, log, and a client."""
