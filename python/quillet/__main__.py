"""`python -m quillet` is the command `quillet`."""

from quillet.cli import main

if __name__ == "__main__":
    main()
