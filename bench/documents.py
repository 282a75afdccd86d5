# SPDX-License-Identifier: BSD-2-Clause
"""Files that a report writes."""
import sys


def write(path, text):
    with open(path, 'w') as file:
        file.write(text)


def put_figures(path, script, text):
    """Puts what the script has measured between its markers in a document."""
    begin, end = f'<!-- figures: written by {script} --write-docs -->', '<!-- end of figures -->'
    with open(path) as file:
        document = file.read()
    if document.count(begin) != 1 or document.count(end) != 1:
        sys.exit(f'{path}: expected the two markers of the figures, once each')
    head, rest = document.split(begin)
    write(path, f'{head}{begin}\n\n{text.strip()}\n\n{end}{rest.split(end)[1]}')
