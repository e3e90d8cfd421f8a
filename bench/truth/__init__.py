"""How far the answers of a workspace are right, found, stable and fast, measured against what others say.

`python -m bench.truth` from the top folder lists the runners; docs/answers-agreement.md says what each compares.
"""
