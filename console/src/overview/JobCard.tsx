import { Button } from '@patternfly/react-core/dist/esm/components/Button';
import { Card, CardBody, CardTitle } from '@patternfly/react-core/dist/esm/components/Card';
import { useEffect, useRef, useState } from 'react';
import { useStore } from '../api/store';
import { Failure } from '../join/Failure';
import { Finished } from '../join/Finished';
import { forgetJob, job, lastForm } from '../join/job';
import { Running } from '../join/Running';
import { useSteps } from '../join/useSteps';
import { navigate } from '../shell/router';
import { t } from '../texts';

interface JobCardProps {
  // What the appliance is at, whoever began it.
  busy: 'join' | 'leave' | null;
  // The dialog shows the job itself.
  dialogOpen: boolean;
}

// A join or leave that runs without its dialog: closed, begun in another window, or on the command line. Shows the end
// of one, too, when it was begun in this window.
export function JobCard({ busy, dialogOpen }: JobCardProps) {
  const own = useStore(job);
  const [since] = useState(() => Date.now());
  const active = busy !== null && !dialogOpen;
  const record = useSteps(active);
  const wasOpen = useRef(dialogOpen);
  useEffect(() => {
    // The browser's "back" closes the dialog as well: its result has been seen.
    if (wasOpen.current && !dialogOpen && own.state !== 'running') {
      forgetJob();
      lastForm.set(null);
    }
    wasOpen.current = dialogOpen;
  }, [dialogOpen, own.state]);

  if (dialogOpen) return null;
  if (busy !== null) {
    const mine = own.state === 'running' ? own : null;
    const domain = mine?.domain ?? record?.domain ?? '';
    return (
      <Card component="section" aria-labelledby="card-job">
        <CardTitle component="h2" id="card-job">
          {t(`overview.busy.${busy}`, { domain })}
        </CardTitle>
        <CardBody>
          <Running
            inDialog={false}
            action={busy}
            domain={domain}
            begun={mine?.begun ?? (record === null ? since : record.started * 1000)}
            record={record}
            cutOff={mine?.cutOff ?? false}
          />
        </CardBody>
      </Card>
    );
  }
  if (own.state !== 'done' && own.state !== 'failed') return null;
  return (
    <Card component="section" aria-labelledby="card-job">
      <CardTitle component="h2" id="card-job">
        {own.state === 'done'
          ? t(own.action === 'join' ? 'overview.joined' : 'overview.left', { domain: own.domain })
          : t(own.action === 'join' ? 'overview.joinFailed' : 'overview.leaveFailed', { domain: own.domain })}
      </CardTitle>
      <CardBody className="vorn-stack">
        {own.state === 'done' ? <Finished job={own} /> : <Failure job={own} />}
        <div className="vorn-header__actions">
          {own.state === 'failed' && own.action === 'join' && (
            <Button variant="primary" onClick={() => navigate('/join')}>
              {t('overview.openJoin')}
            </Button>
          )}
          <Button variant="secondary" onClick={forgetJob}>
            {t('common.close')}
          </Button>
        </div>
      </CardBody>
    </Card>
  );
}
