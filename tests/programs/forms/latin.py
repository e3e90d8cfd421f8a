# -*- coding: latin-1 -*-
name = "éè"
été = name
def f(): "café"; return été
