import { Button } from '@patternfly/react-core/dist/esm/components/Button';
import { Modal, ModalBody, ModalFooter, ModalHeader } from '@patternfly/react-core/dist/esm/components/Modal';
import { useState } from 'react';
import { useStore } from '../api/store';
import { Finished } from '../join/Finished';
import { forgetJob, job, startLeave } from '../join/job';
import { Running } from '../join/Running';
import { useSteps } from '../join/useSteps';
import { t } from '../texts';
import { emptyLeave, LeaveForm, leaveProblems, type LeaveValues } from './LeaveForm';

interface LeaveDialogProps {
  // The domain that is left: its NetBIOS name, as the overview shows it.
  domain: string;
  // The computer account that stays behind; null while it is not known.
  account: string | null;
  onClose: () => void;
}

const kForm = 'leave-form';

// Says what leaving does, asks for a deliberate act, and shows what came of it.
export function LeaveDialog({ domain, account, onClose }: LeaveDialogProps) {
  const now = useStore(job);
  const [values, setValues] = useState<LeaveValues>(emptyLeave);
  const [insist, setInsist] = useState(false);
  const running = now.state === 'running' && now.action === 'leave';
  const done = now.state === 'done' && now.action === 'leave';
  const failed = now.state === 'failed' && now.action === 'leave' ? now : null;
  const record = useSteps(running);

  const problems = leaveProblems(values, domain);
  const close = () => {
    forgetJob();
    onClose();
  };
  const submit = () => {
    const first = Object.keys(problems)[0];
    if (first !== undefined) {
      setInsist(true);
      setTimeout(() => document.getElementById(`leave-${first}`)?.focus());
      return;
    }
    setInsist(false);
    const { deleteAccount, user, password } = values;
    setValues({ ...values, password: '' });
    void startLeave(
      domain,
      account,
      deleteAccount ? { delete_account: true, username: user.trim(), password } : { delete_account: false },
    );
  };

  const title = running || done ? t('overview.leave') : t('leave.title', { domain });
  return (
    <Modal
      isOpen
      variant="medium"
      onClose={close}
      aria-labelledby="leave-title"
      elementToFocus="#leave-confirm, #leave-close"
    >
      <ModalHeader
        title={title}
        labelId="leave-title"
        {...(running || done ? {} : { titleIconVariant: 'warning' })}
      />
      <ModalBody>
        {running && (
          <Running action="leave" domain={now.domain} begun={now.begun} record={record} cutOff={now.cutOff} />
        )}
        {done && <Finished job={now} />}
        {!running && !done && (
          <LeaveForm
            id={kForm}
            domain={domain}
            account={account}
            values={values}
            onChange={(part) => setValues((before) => ({ ...before, ...part }))}
            problems={problems}
            insist={insist}
            onSubmit={submit}
            failure={failed}
          />
        )}
      </ModalBody>
      <ModalFooter>
        {!running && !done && (
          <Button variant="danger" type="submit" form={kForm} isDisabled={problems.confirm !== undefined}>
            {t('leave.submit')}
          </Button>
        )}
        <Button id="leave-close" variant={done ? 'primary' : running ? 'secondary' : 'link'} onClick={close}>
          {t(running ? 'leave.background' : done ? 'common.close' : 'common.cancel')}
        </Button>
      </ModalFooter>
    </Modal>
  );
}
