{ Raises an exception of its own class with a message, and one of a class
  that is no Exception, catching both. }
program raises;
{$mode objfpc}
uses sysutils;

type
  ETooDeep = class(Exception);
  TPlain = class
  end;

procedure Dive(Depth: Integer);
begin
  raise ETooDeep.CreateFmt('depth %d is too deep', [Depth]); // line:raise
end;

begin
  try
    Dive(12);
  except
    on E: ETooDeep do
      WriteLn('caught ', E.Message);
  end;
  try
    raise TPlain.Create;
  except
    WriteLn('caught a plain one');
  end;
end.
