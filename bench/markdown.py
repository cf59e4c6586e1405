"""Tables for the documentation."""


def table(head, rows):
    """A Markdown table of texts."""
    lines = ["| " + " | ".join(head) + " |", "|" + "---|" * len(head)]
    return "\n".join(lines + ["| " + " | ".join(row) + " |" for row in rows])
