"""How the parts of script/test-kernel give up."""


class Failure(Exception):
    """Something was wrong: one line for the person who reads it."""


class Skipped(Exception):
    """The test cannot run here: the reason."""
