"""The language server: what `quillet.Workspace` answers, for editors.

A thread reads messages (streams.py) and puts them into a queue; the main thread does what they ask in their order
(work.py), so that an answer is always one for the text that its question was asked of. A client that takes a question
back, or changes the text under one that takes long, ends the native work in its middle.

What messages must hold is what pygls and lsprotocol say; those that are plainly right are read without them, since
loading them takes ten times as long as a first answer (params.py). projects.py knows which workspace a file belongs to,
and documents.py what the editor holds. What is asked is answered in navigation.py, reading.py, writing.py, and
diagnostics.py; what takes long tells its progress (progress.py).
"""
