"""What the integration tests are made of: a private bus, servers, agents, applications and a real rvd.

Nothing here sleeps: whoever waits, waits for an event, for at most DEADLINE seconds."""

# Seconds until a wait is given up as failed. Long, because a build with a sanitizer on a busy machine is
# slow; a test that passes never waits for it.
DEADLINE = 90
