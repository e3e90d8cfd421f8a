"""Answers about programs as tools for agents: `quillet mcp` speaks the Model Context Protocol.

`targets` says what a question is about, `answers` asks a workspace and makes pages, `server` tells the protocol's
library about them.
"""
