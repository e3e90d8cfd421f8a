async def f():
 for x in y:
  for x in y:
   for x in y:
    for x in y:
     for x in y:
      for x in y:
       for x in y:
        for x in y:
         for x in y:
          for x in y:
           for x in y:
            for x in y:
             for x in y:
              for x in y:
               for x in y:
                for x in y:
                 for x in y:
                  for x in y:
                   for x in y:
                    pass
async def f():
 for x in y:
  for x in y:
   for x in y:
    for x in y:
     for x in y:
      for x in y:
       for x in y:
        for x in y:
         for x in y:
          for x in y:
           for x in y:
            for x in y:
             for x in y:
              for x in y:
               for x in y:
                for x in y:
                 for x in y:
                  for x in y:
                   for x in y:
                    for x in y:
                     pass
async def f():
 for x in y:
  for x in y:
   for x in y:
    for x in y:
     for x in y:
      for x in y:
       for x in y:
        for x in y:
         for x in y:
          for x in y:
           for x in y:
            for x in y:
             for x in y:
              for x in y:
               for x in y:
                for x in y:
                 for x in y:
                  for x in y:
                   for x in y:
                    for x in y:
                     for x in y:
                      pass
async def f():
 for x in y:
  for x in y:
   for x in y:
    for x in y:
     for x in y:
      for x in y:
       for x in y:
        for x in y:
         for x in y:
          for x in y:
           for x in y:
            for x in y:
             for x in y:
              for x in y:
               for x in y:
                for x in y:
                 for x in y:
                  for x in y:
                   for x in y:
                    for x in y:
                     for x in y:
                      for x in y:
                       pass
async def f():
 while x:
  while x:
   while x:
    while x:
     while x:
      while x:
       while x:
        while x:
         while x:
          while x:
           while x:
            while x:
             while x:
              while x:
               while x:
                while x:
                 while x:
                  while x:
                   while x:
                    pass
async def f():
 while x:
  while x:
   while x:
    while x:
     while x:
      while x:
       while x:
        while x:
         while x:
          while x:
           while x:
            while x:
             while x:
              while x:
               while x:
                while x:
                 while x:
                  while x:
                   while x:
                    while x:
                     pass
async def f():
 while x:
  while x:
   while x:
    while x:
     while x:
      while x:
       while x:
        while x:
         while x:
          while x:
           while x:
            while x:
             while x:
              while x:
               while x:
                while x:
                 while x:
                  while x:
                   while x:
                    while x:
                     while x:
                      pass
async def f():
 while x:
  while x:
   while x:
    while x:
     while x:
      while x:
       while x:
        while x:
         while x:
          while x:
           while x:
            while x:
             while x:
              while x:
               while x:
                while x:
                 while x:
                  while x:
                   while x:
                    while x:
                     while x:
                      while x:
                       pass
async def f():
 with x as y, z:
  with x as y, z:
   with x as y, z:
    with x as y, z:
     with x as y, z:
      with x as y, z:
       with x as y, z:
        with x as y, z:
         with x as y, z:
          with x as y, z:
           with x as y, z:
            with x as y, z:
             with x as y, z:
              with x as y, z:
               with x as y, z:
                with x as y, z:
                 with x as y, z:
                  with x as y, z:
                   with x as y, z:
                    pass
async def f():
 with x as y, z:
  with x as y, z:
   with x as y, z:
    with x as y, z:
     with x as y, z:
      with x as y, z:
       with x as y, z:
        with x as y, z:
         with x as y, z:
          with x as y, z:
           with x as y, z:
            with x as y, z:
             with x as y, z:
              with x as y, z:
               with x as y, z:
                with x as y, z:
                 with x as y, z:
                  with x as y, z:
                   with x as y, z:
                    with x as y, z:
                     pass
async def f():
 with x as y, z:
  with x as y, z:
   with x as y, z:
    with x as y, z:
     with x as y, z:
      with x as y, z:
       with x as y, z:
        with x as y, z:
         with x as y, z:
          with x as y, z:
           with x as y, z:
            with x as y, z:
             with x as y, z:
              with x as y, z:
               with x as y, z:
                with x as y, z:
                 with x as y, z:
                  with x as y, z:
                   with x as y, z:
                    with x as y, z:
                     with x as y, z:
                      pass
async def f():
 with x as y, z:
  with x as y, z:
   with x as y, z:
    with x as y, z:
     with x as y, z:
      with x as y, z:
       with x as y, z:
        with x as y, z:
         with x as y, z:
          with x as y, z:
           with x as y, z:
            with x as y, z:
             with x as y, z:
              with x as y, z:
               with x as y, z:
                with x as y, z:
                 with x as y, z:
                  with x as y, z:
                   with x as y, z:
                    with x as y, z:
                     with x as y, z:
                      with x as y, z:
                       pass
async def f():
 try:
  try:
   try:
    try:
     try:
      try:
       try:
        try:
         try:
          try:
           try:
            try:
             try:
              try:
               try:
                try:
                 try:
                  try:
                   try:
                    pass
                   finally: pass
                  finally: pass
                 finally: pass
                finally: pass
               finally: pass
              finally: pass
             finally: pass
            finally: pass
           finally: pass
          finally: pass
         finally: pass
        finally: pass
       finally: pass
      finally: pass
     finally: pass
    finally: pass
   finally: pass
  finally: pass
 finally: pass
async def f():
 try:
  try:
   try:
    try:
     try:
      try:
       try:
        try:
         try:
          try:
           try:
            try:
             try:
              try:
               try:
                try:
                 try:
                  try:
                   try:
                    try:
                     pass
                    finally: pass
                   finally: pass
                  finally: pass
                 finally: pass
                finally: pass
               finally: pass
              finally: pass
             finally: pass
            finally: pass
           finally: pass
          finally: pass
         finally: pass
        finally: pass
       finally: pass
      finally: pass
     finally: pass
    finally: pass
   finally: pass
  finally: pass
 finally: pass
async def f():
 try:
  try:
   try:
    try:
     try:
      try:
       try:
        try:
         try:
          try:
           try:
            try:
             try:
              try:
               try:
                try:
                 try:
                  try:
                   try:
                    try:
                     try:
                      pass
                     finally: pass
                    finally: pass
                   finally: pass
                  finally: pass
                 finally: pass
                finally: pass
               finally: pass
              finally: pass
             finally: pass
            finally: pass
           finally: pass
          finally: pass
         finally: pass
        finally: pass
       finally: pass
      finally: pass
     finally: pass
    finally: pass
   finally: pass
  finally: pass
 finally: pass
async def f():
 try:
  try:
   try:
    try:
     try:
      try:
       try:
        try:
         try:
          try:
           try:
            try:
             try:
              try:
               try:
                try:
                 try:
                  try:
                   try:
                    try:
                     try:
                      try:
                       pass
                      finally: pass
                     finally: pass
                    finally: pass
                   finally: pass
                  finally: pass
                 finally: pass
                finally: pass
               finally: pass
              finally: pass
             finally: pass
            finally: pass
           finally: pass
          finally: pass
         finally: pass
        finally: pass
       finally: pass
      finally: pass
     finally: pass
    finally: pass
   finally: pass
  finally: pass
 finally: pass
async def f():
 if x:
  if x:
   if x:
    if x:
     if x:
      if x:
       if x:
        if x:
         if x:
          if x:
           if x:
            if x:
             if x:
              if x:
               if x:
                if x:
                 if x:
                  if x:
                   if x:
                    pass
async def f():
 if x:
  if x:
   if x:
    if x:
     if x:
      if x:
       if x:
        if x:
         if x:
          if x:
           if x:
            if x:
             if x:
              if x:
               if x:
                if x:
                 if x:
                  if x:
                   if x:
                    if x:
                     pass
async def f():
 if x:
  if x:
   if x:
    if x:
     if x:
      if x:
       if x:
        if x:
         if x:
          if x:
           if x:
            if x:
             if x:
              if x:
               if x:
                if x:
                 if x:
                  if x:
                   if x:
                    if x:
                     if x:
                      pass
async def f():
 if x:
  if x:
   if x:
    if x:
     if x:
      if x:
       if x:
        if x:
         if x:
          if x:
           if x:
            if x:
             if x:
              if x:
               if x:
                if x:
                 if x:
                  if x:
                   if x:
                    if x:
                     if x:
                      if x:
                       pass
async def f():
 async with x:
  async with x:
   async with x:
    async with x:
     async with x:
      async with x:
       async with x:
        async with x:
         async with x:
          async with x:
           async with x:
            async with x:
             async with x:
              async with x:
               async with x:
                async with x:
                 async with x:
                  async with x:
                   async with x:
                    pass
async def f():
 async with x:
  async with x:
   async with x:
    async with x:
     async with x:
      async with x:
       async with x:
        async with x:
         async with x:
          async with x:
           async with x:
            async with x:
             async with x:
              async with x:
               async with x:
                async with x:
                 async with x:
                  async with x:
                   async with x:
                    async with x:
                     pass
async def f():
 async with x:
  async with x:
   async with x:
    async with x:
     async with x:
      async with x:
       async with x:
        async with x:
         async with x:
          async with x:
           async with x:
            async with x:
             async with x:
              async with x:
               async with x:
                async with x:
                 async with x:
                  async with x:
                   async with x:
                    async with x:
                     async with x:
                      pass
async def f():
 async with x:
  async with x:
   async with x:
    async with x:
     async with x:
      async with x:
       async with x:
        async with x:
         async with x:
          async with x:
           async with x:
            async with x:
             async with x:
              async with x:
               async with x:
                async with x:
                 async with x:
                  async with x:
                   async with x:
                    async with x:
                     async with x:
                      async with x:
                       pass
async def f():
 for x in y:
   pass
 else:
  for x in y:
    pass
  else:
   for x in y:
     pass
   else:
    for x in y:
      pass
    else:
     for x in y:
       pass
     else:
      for x in y:
        pass
      else:
       for x in y:
         pass
       else:
        for x in y:
          pass
        else:
         for x in y:
           pass
         else:
          for x in y:
            pass
          else:
           for x in y:
             pass
           else:
            for x in y:
              pass
            else:
             for x in y:
               pass
             else:
              for x in y:
                pass
              else:
               for x in y:
                 pass
               else:
                for x in y:
                  pass
                else:
                 for x in y:
                   pass
                 else:
                  for x in y:
                    pass
                  else:
                   for x in y:
                     pass
                   else:
                    pass
async def f():
 for x in y:
   pass
 else:
  for x in y:
    pass
  else:
   for x in y:
     pass
   else:
    for x in y:
      pass
    else:
     for x in y:
       pass
     else:
      for x in y:
        pass
      else:
       for x in y:
         pass
       else:
        for x in y:
          pass
        else:
         for x in y:
           pass
         else:
          for x in y:
            pass
          else:
           for x in y:
             pass
           else:
            for x in y:
              pass
            else:
             for x in y:
               pass
             else:
              for x in y:
                pass
              else:
               for x in y:
                 pass
               else:
                for x in y:
                  pass
                else:
                 for x in y:
                   pass
                 else:
                  for x in y:
                    pass
                  else:
                   for x in y:
                     pass
                   else:
                    for x in y:
                      pass
                    else:
                     pass
async def f():
 for x in y:
   pass
 else:
  for x in y:
    pass
  else:
   for x in y:
     pass
   else:
    for x in y:
      pass
    else:
     for x in y:
       pass
     else:
      for x in y:
        pass
      else:
       for x in y:
         pass
       else:
        for x in y:
          pass
        else:
         for x in y:
           pass
         else:
          for x in y:
            pass
          else:
           for x in y:
             pass
           else:
            for x in y:
              pass
            else:
             for x in y:
               pass
             else:
              for x in y:
                pass
              else:
               for x in y:
                 pass
               else:
                for x in y:
                  pass
                else:
                 for x in y:
                   pass
                 else:
                  for x in y:
                    pass
                  else:
                   for x in y:
                     pass
                   else:
                    for x in y:
                      pass
                    else:
                     for x in y:
                       pass
                     else:
                      pass
async def f():
 for x in y:
   pass
 else:
  for x in y:
    pass
  else:
   for x in y:
     pass
   else:
    for x in y:
      pass
    else:
     for x in y:
       pass
     else:
      for x in y:
        pass
      else:
       for x in y:
         pass
       else:
        for x in y:
          pass
        else:
         for x in y:
           pass
         else:
          for x in y:
            pass
          else:
           for x in y:
             pass
           else:
            for x in y:
              pass
            else:
             for x in y:
               pass
             else:
              for x in y:
                pass
              else:
               for x in y:
                 pass
               else:
                for x in y:
                  pass
                else:
                 for x in y:
                   pass
                 else:
                  for x in y:
                    pass
                  else:
                   for x in y:
                     pass
                   else:
                    for x in y:
                      pass
                    else:
                     for x in y:
                       pass
                     else:
                      for x in y:
                        pass
                      else:
                       pass
