f"{f"{f"{1}"}"}" f"""{
# c
{1: 2}["""x"""]:{y:{z}}}""" f"{a}}" f"\N{DASH}{{}}" f"{x
import y
f"{lambda x: 1}" f"{(