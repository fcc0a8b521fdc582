"""The run-time error that reaches a Python host."""


class VbError(Exception):
    """A run-time error that escaped the library: the language's error number, its
    description and the source (module and procedure) where it happened."""

    def __init__(self, number: int, description: str = "", source: str = "") -> None:
        super().__init__(number, description, source)
        self.number = number
        self.description = description
        self.source = source

    def __str__(self) -> str:
        where = f" (in {self.source})" if self.source else ""
        return f"error {self.number}: {self.description}{where}"
